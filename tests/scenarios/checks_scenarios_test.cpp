// Runs that stop before the driver: command-line errors, and the checks of
// caller, instance and copies. Each prints its catalog text (or the fallback
// line without catalogs), ends with its code and leaves the world as it was.
#include "scenario_fixture.h"

#include "sim/kxlsim/world_reader.h"
#include "tests/support/command_run.h"

namespace {

using kxlsim::localMachine;
using kxltest::RunResult;
using kxltest::RunSetup;
using kxltest::ScenarioTest;

// The en_US catalog texts as the user sees them.
const std::string kUsageText =
    "KXL1946E  Usage: KXLIUPGRADE [-q] [-a AuthType] [-p InstProfPath]\n"
    "                  [-u AccountName[,Password]] [-install] [-forcecn]\n"
    "                  [-j TEXT_SEARCH[,ServiceName][,PortNumber]] [-?] InstName\n"
    "\n"
    "  -q        quiet: print no final message\n"
    "  -a        authentication type of the upgraded instance: SERVER, CLIENT,\n"
    "            SERVER_ENCRYPT, DCS, DCE, DCS_ENCRYPT, DCE_SERVER_ENCRYPT,\n"
    "            KERBEROS or KERBEROS_SERVER_ENCRYPT\n"
    "  -p        instance profile path to hold the instance after the upgrade\n"
    "  -u        account the instance's services run under; required for a\n"
    "            partitioned instance\n"
    "  -install  run on behalf of an installer\n"
    "  -forcecn  on the machines of other partitions, register the instance under\n"
    "            this copy without moving their profiles\n"
    "  -j        configure the text search service of the instance\n"
    "  -?        show this text\n"
    "  InstName  the instance to upgrade to this copy\n";

std::string unknownInstanceText(const std::string &name) {
  return "KXL1951W  The instance \"" + name + "\" does not belong to any installed copy of the product.\n";
}
const std::string kBadVersionText =
    "KXL1949E  The instance \"INST1\" cannot be upgraded by this command: the versions of its "
    "copy and of this copy do not allow it.\n";
const std::string kActiveText =
    "KXL1953E  The instance is active. Stop all of its services and run the command again.\n";
const std::string kLegacyText = "KXL1392W  The command KXLIMIGR is deprecated. Use KXLIUPGRADE instead.\n";

void setCopyLevel(ScenarioTest &t, const std::string &copy, int version, int release) {
  std::string key = "SOFTWARE\\ZAV\\KXL\\InstalledCopies\\" + copy + "\\CurrentVersion";
  t.world.setString(localMachine(), key, "Version", std::to_string(version));
  t.world.setString(localMachine(), key, "Release", std::to_string(release));
}
void setToolExit(ScenarioTest &t, DWORD code) {
  kxlsim::setToolExitCode(t.world, "kxlckupgrade", code);
}
void notAdmin(ScenarioTest &t) {
  t.world.setDword(localMachine(), t.kIdentity, "LocalAdmin", 0x01);
  t.world.setString(localMachine(), t.kIdentity, "AuthId", "JDOE");
}
void reserved(ScenarioTest &t) {
  t.world.setString(localMachine(), "SOFTWARE\\ZAV\\KXL\\InstalledCopies\\KXL95\\GLOBAL_PROFILE",
                    "KXLRESERVEDINST", "inst1");
}

const std::string k1918 =
    "KXL1918E  The installed copies of the product, or the copy this command belongs to, cannot be found.\n";
const std::string k1069 =
    "KXL1069E  The database check program \"kxlckupgrade\" ended with exit code \"7\". The instance was not "
    "upgraded.\n";

const std::string kSystm = std::string(ScenarioTest::kOldCopy) + "\\INST1\\kxlsystm";
const std::string k1926 = "KXL1926E  The node type of the instance cannot be read from its database manager "
                          "configuration file \"" +
                          kSystm + "\". The instance was not changed.\n";
const std::string k1927 =
    "KXL1927E  The current directory is too long to hold the files of the database check. "
    "Run the command from a directory with a shorter path. The instance was not changed.\n";

// kxlsystm cut to `size` bytes (0: empty), or with the node type `type`.
template <std::size_t size, uint8_t type = 1> void systm(ScenarioTest &t) {
  std::vector<uint8_t> image;
  ASSERT_TRUE(kxlsim::readFileHead(kSystm, 1 << 20, image));
  image.resize(std::min(image.size(), size));
  if (image.size() > 41)
    image[40] = type, image[41] = 0;
  t.world.writeFile(kSystm, image);
}

// A release that cannot be read.
template <const char *copy> void unreadableRelease(ScenarioTest &t) {
  t.world.setString(localMachine(),
                    std::string("SOFTWARE\\ZAV\\KXL\\InstalledCopies\\") + copy + "\\CurrentVersion",
                    "Release", std::string(300, '7'));
}
constexpr char kOld[] = "KXL95", kCurrent[] = "KXL101";

// A directory of `length` characters on drive C:.
std::string directoryOf(std::size_t length) {
  std::string path = "C:";
  while (path.size() < length)
    path += "\\" + std::string(std::min<std::size_t>(length - path.size() - 1, 100), 'd');
  return path;
}

struct Refusal {
  std::vector<std::string> args;
  long long result;
  std::string out;
  void (*setup)(ScenarioTest &) = nullptr;
  const char *faults = "";
  bool catalogs = true;
  bool checkToolRan = false; // its files are left; the registry is as it was
  std::string cwd = "C:\\";
  const char *program = "kxliupgrade.exe"; // under the legacy name, the command warns at its end
};

void legacyName(ScenarioTest &t) {
  t.installCommandAs("kxlimigr.exe");
}

// clang-format off
const Refusal kRefusals[] = {
    {{}, -1946, kUsageText},
    {{"INST1", "-?"}, -1946, kUsageText},
    {{"/x", "INST1"}, -1946, kUsageText},
    {{"INST1", "-a"}, -1946, kUsageText},
    {{"INST1", "INST2"}, -1946, kUsageText},
    {{"NINECHARS"}, -1916, "KXL1916E  The instance name is not valid. An instance name has 1 to 8 characters.\n"},
    {{"-p", "C:\\nowhere", "INST1"}, -1920, "KXL1920E  The instance profile path given with -p is not an existing directory.\n"},
    {{"-u", std::string(31, 'u'), "INST1"}, -1921, "KXL1921E  The account name given with -u is not valid, or the password could not be read.\n"},
    {{"-j", "FULL_TEXT", "INST1"}, -1934, "KXL1934E  The value of -j is not valid. Give TEXT_SEARCH, optionally followed by a service "
                                          "name or a port number, or by a service name and a port number.\n"},
    {{"-j", "TEXT_SEARCH,1023", "INST1"}, -1701, "KXL1701E  The text search port must lie between 1024 and 65535, and the text search "
                                                 "service name may have at most 14 characters.\n"},
    {{"kxldas00"}, -1954, "KXL1954E  The administration server instance cannot be upgraded with this command.\n"},
    {{}, -1946, "KXLIMIGR:syntax error, RC = -1946\n", nullptr, "", false},
    {{"NINECHARS"}, -1916, "KXLIMIGR:processing complete, RC = -1916\n", nullptr, "", false},
    {{"-j", "TEXT_SEARCH,99999", "INST1"}, -1701, "KXLIMIGR:processing complete, RC = -1701\n", nullptr, "", false},
    {{"KXLDAS00"}, -1954, "KXLIMIGR:processing complete, RC = -1954\n", nullptr, "", false},
    // Quiet mode prints nothing; installer mode ends with 1 or 2.
    {{"-q", "NOSUCH"}, 1951, ""},
    {{"-install", "NOSUCH"}, 1, unknownInstanceText("NOSUCH")},
    {{"-install", "-x", "NOSUCH"}, 2, kUsageText},
    {{"nosuch"}, 1951, unknownInstanceText("NOSUCH")},
    // The level check of the instance's copy comes first, so an instance of
    // the current copy is reported as such only by a current copy below 9.7.
    {{"NEWINST"}, 1950, "KXL1950W  The instance \"NEWINST\" already belongs to this copy. Nothing was changed.\n", [](ScenarioTest &t) {
       setCopyLevel(t, "KXL101", 9, 6);
       t.addInstance("NEWINST", "KXL101", std::string(ScenarioTest::kCurrentCopy) + "\\NEWINST", 10, 1); }},
    // Copy versions outside the upgrade range; a current copy below 9 is refused to installers too.
    {{"INST1"}, -1949, kBadVersionText, [](ScenarioTest &t) { setCopyLevel(t, "KXL95", 9, 7); }},
    {{"INST1"}, -1949, kBadVersionText, [](ScenarioTest &t) { setCopyLevel(t, "KXL95", 10, 1); }},
    {{"INST1"}, -1949, kBadVersionText, [](ScenarioTest &t) { setCopyLevel(t, "KXL101", 8, 2); }},
    {{"-install", "INST1"}, 2, kBadVersionText, [](ScenarioTest &t) { setCopyLevel(t, "KXL101", 8, 2); }},
    {{"INST1"}, -1139, "KXL1139E  The instance is reserved by the global profile of its copy and cannot be upgraded.\n", reserved},
    {{"-u", "a,b", "INST2"}, -1069, k1069, [](ScenarioTest &t) { reserved(t); setToolExit(t, 7); }, "", true, true}, // only the reserved name
    {{"INST1"}, -1, "SQL1092N  The user \"JDOE\" is not a local administrator of this machine and may not upgrade instances.\n", notAdmin},
    {{"INST1"}, -1, "KXLIMIGR:processing complete, SQLCODE=-1092\n", notAdmin, "", false},
    // A partitioned instance needs an account name and a password.
    {{"INST2"}, -1946, kUsageText},
    {{"-u", "kxlsvc", "INST2"}, -1946, kUsageText},
    // An active instance is refused before the check tool; for a partitioned
    // one, the second partition runs on the other machine.
    {{"INST1"}, -1953, kActiveText,
     [](ScenarioTest &t) { t.world.setDword(localMachine(), "SOFTWARE\\ZAV\\KXLSIM\\Services\\INST1", "State", 4); }},
    {{"-u", "kxlsvc,secret", "INST2"}, -1953, kActiveText,
     [](ScenarioTest &t) { t.world.setDword(kxlsim::remoteMachine("WINSRV2"), "SOFTWARE\\ZAV\\KXLSIM\\Services\\INST2-1", "State", 4); }},
    {{"INST1"}, -1069, k1069, [](ScenarioTest &t) { setToolExit(t, 7); }, "", true, true},
    {{"INST1"}, -1069, "KXLIMIGR:processing complete, RC = -1069\n", [](ScenarioTest &t) { setToolExit(t, 7); }, "", false, true},
    // A failed read of which installation is current, or a switch between the
    // installations that fails either way, ends the run before anything
    // changes: profile reads in the wrong installation would otherwise take
    // the old copy for the current one.
    {{"INST1"}, -1918, k1918, nullptr, "sqloGetCurrentInstallationName:2"}, // global profile check
    {{"INST1"}, -1918, k1918, nullptr, "sqloGetCurrentInstallationName:4"}, // binding the instance
    {{"INST1"}, -1918, k1918, nullptr, "sqloGetCurrentInstallationName:5"}, // database check
    {{"INST1"}, -1918, k1918, nullptr, "sqloSwitchToInstallationName:1"},
    {{"INST1"}, -1918, k1918, nullptr, "sqloSwitchToInstallationName:2"},
    {{"INST1"}, -1918, k1918, nullptr, "sqloSwitchToInstallationName:3"},
    {{"INST1"}, -1918, k1918, nullptr, "sqloSwitchToInstallationName:4"},
    {{"INST1"}, -1918, k1918, nullptr, "sqloPRegProfilePE:5"},
    {{"INST1"}, -1918, k1918, nullptr, "sqloSwitchToInstallationName:6", true, true}, // the switch back after the check
    // A copy's version that cannot be read is never taken for version 0, which
    // would let an instance of a newer copy through or refuse the current copy.
    {{"INST1"}, -1918, k1918, unreadableRelease<kOld>},
    {{"INST1"}, -1918, k1918, unreadableRelease<kCurrent>},
    // The node type decides which services the instance gets; an instance
    // whose kxlsystm gives none is refused before anything changes.
    {{"INST1"}, -1926, k1926, systm<0>},
    {{"INST1"}, -1926, k1926, systm<41>}, // cut before the node type
    {{"INST1"}, -1926, k1926, systm<1 << 20, 0>},
    {{"INST1"}, -1926, k1926, systm<1 << 20, 6>},
    {{"INST1"}, -1926, k1926, nullptr, "sqloopenp:4"},
    {{"INST1"}, -1926, k1926, nullptr, "sqloread:5"},
    // The check tool works in the current directory: its log-file argument and
    // the copy of its explanation must be whole paths there, or the run stops
    // before the tool starts.
    {{"INST1"}, -1069, k1069, [](ScenarioTest &t) { setToolExit(t, 7); }, "", true, true, directoryOf(246)},
    {{"INST1"}, -1927, k1927, nullptr, "", true, false, directoryOf(247)},
    {{"INST1"}, -1927, k1927, nullptr, "", true, false, directoryOf(254)},
    {{"INST1"}, -1927, k1927, nullptr, "", true, false, directoryOf(300)},
    // The check tool's findings name its log file, in the current directory.
    {{"INST1"}, -1205, "KXL1205E  The database check found objects that must be corrected before the instance can be upgraded. "
                       "The details are in the log file \"\"C:\\work\\check\\upgrade.log\"\".\n",
     [](ScenarioTest &t) { setToolExit(t, 3); }, "", true, true, "C:\\work\\check"},
    // The legacy name's warning ends every run, in quiet mode too, but not a
    // command line that fails before the name is known.
    {{"nosuch"}, 1951, unknownInstanceText("NOSUCH") + "\n\n" + kLegacyText, legacyName, "", true, false, "C:\\", "kxlimigr.exe"},
    {{"-q", "nosuch"}, 1951, "\n\n" + kLegacyText, legacyName, "", true, false, "C:\\", "kxlimigr.exe"},
    {{"-?"}, -1946, kUsageText, legacyName, "", true, false, "C:\\", "kxlimigr.exe"},
    {{"nosuch"}, 1951, "KXLIMIGR:processing complete, RC = 1951\n\n\nKXLIMIGR:syntax warning, RC = 1392\n", legacyName, "", false, false,
     "C:\\", "kxlimigr.exe"},
};
// clang-format on

class RefusalScenario : public ScenarioTest, public ::testing::WithParamInterface<Refusal> {};

TEST_P(RefusalScenario, PrintsItsTextAndChangesNothing) {
  const Refusal &row = GetParam();
  prepare(row.setup, row.catalogs);
  RunSetup setup;
  setup.faults = row.faults;
  setup.cwd = row.cwd;
  setup.program = row.program;
  RunResult r = run(row.args, setup);
  EXPECT_EQ(r.result, row.result);
  EXPECT_EQ(r.exitCode, row.result & 0xFF);
  EXPECT_EQ(r.out, row.out);
  std::string changed = changes(r);
  if (row.checkToolRan) {
    EXPECT_EQ(changed.find("registry"), std::string::npos) << changed;
    EXPECT_TRUE(kxltest::eventsOf(r, "audit").empty()) << "nothing was upgraded";
    // The tool ran once for the instance, with its log file in the current directory.
    std::string dir = row.cwd.substr(0, row.cwd.find_last_not_of('\\') + 1), escaped;
    for (char c : dir + "\\upgrade.log -t " + dir)
      escaped += c == '\\' ? "\\\\" : std::string(1, c);
    std::vector<std::string> tool = kxltest::eventsOf(r, "program");
    ASSERT_EQ(tool.size(), 1u);
    EXPECT_NE(tool[0].find(kxltest::field("KXLINSTANCE", row.args.back())), std::string::npos) << tool[0];
    EXPECT_NE(tool[0].find("-h -m -not1 -l " + escaped + "\""), std::string::npos) << tool[0];
  } else {
    EXPECT_EQ(changed, "");
    EXPECT_TRUE(r.events.empty()) << "the database check never ran";
  }
}

INSTANTIATE_TEST_SUITE_P(Rows, RefusalScenario, ::testing::ValuesIn(kRefusals));

using CheckScenario = ScenarioTest;

// The check's explanation is copied in the caller's language, English where there is none.
TEST_F(CheckScenario, MessageFileFallsBackToEnglish) {
  setToolExit(*this, 7);
  RunSetup inDir;
  inDir.cwd = "C:\\work";
  for (const auto &[language, catalog] : {std::pair("fr_FR", "en_US"), std::pair("de_DE", "de_DE")}) {
    world.setString(localMachine(), kIdentity, "Language", language);
    run({"INST1"}, inDir);
    EXPECT_EQ(
        kxltestsupport::readHostFile(hostPath("C:\\work\\KXLDBMIG.TXT")),
        kxltestsupport::readHostFile(std::string(KXL_MESSAGE_SOURCES) + "/" + catalog + "/KXLDBMIG.TXT"));
  }
}

} // namespace
