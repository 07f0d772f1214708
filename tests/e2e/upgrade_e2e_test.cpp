// The single-partition instance of the 9.5 copy upgraded in a fresh demo
// world by the installed command, and everything it changed as kxlsim diff
// shows it.
#include "tests/support/command_world.h"

#include <fstream>
#include <iterator>
#include <sstream>
#include <string>
#include <vector>

namespace {

// Everything the upgrade changes, and nothing else (no backup is left in
// C:\windows\temp).
const char kExpectedChanges[] = R"(registry - HKLM\SOFTWARE\ZAV\KXL\InstalledCopies\KXL95\PROFILES\INST1
registry ~ HKLM\SOFTWARE\ZAV\KXLSIM\Instances\INST1 "Copy": "KXL95" -> "KXL101"
registry ~ HKLM\SOFTWARE\ZAV\KXLSIM\Instances\INST1 "Directory": "C:\Program Files\ZAV\KXL95\INST1" -> "C:\Program Files\ZAV\KXL101\INST1"
registry ~ HKLM\SOFTWARE\ZAV\KXLSIM\Services\INST1 "DisplayName": "KXL - KXL95 - INST1" -> "KXL - KXL101 - INST1"
registry ~ HKLM\SOFTWARE\ZAV\KXLSIM\Services\INST1 "ImagePath": "C:\Program Files\ZAV\KXL95\bin\kxlsyscs.exe" -> "C:\Program Files\ZAV\KXL101\bin\kxlsyscs.exe"
registry + HKLM\SOFTWARE\ZAV\KXL\InstalledCopies\KXL101\PROFILES\INST1
file + C:\KXLDBMIG.TXT (440 bytes, fnv 99c1bf416a879d93)
       + Database check before an instance upgrade
       + ==========================================
       + 
       + The check program examines every database of the instance before the
       + instance moves to a newer copy of the product. It writes its findings to
       + the log file named with -l.
       + 
       + Exit codes
       +   0  every database can be upgraded
       +   1  warnings were found; the upgrade may go on
       +   2  the instance has no databases
       +   3  objects were found that must be corrected first
file + C:\Program Files\ZAV\KXL101\INST1\bin\rsm.cfg (10 bytes, fnv cf1a9f0cdf3562f0)
       + rsm = on
file + C:\Program Files\ZAV\KXL101\INST1\cfg\djxclassic2.cfg (13 bytes, fnv 44a60aba95ae67c5)
       + classic = 2
file + C:\Program Files\ZAV\KXL101\INST1\cfg\kxldj.ini (28 bytes, fnv 807da70b3e7841df)
       + [federation]
       + enabled = no
file + C:\Program Files\ZAV\KXL101\INST1\kxlmd_config.xml (28 bytes, fnv 7d5c60b04106967e)
       + <config instance="INST1"/>
file + C:\Program Files\ZAV\KXL101\INST1\kxlsystm (16384 bytes, fnv 3920934884e75c52)
file + C:\Program Files\ZAV\KXL101\INST1\security\kxlaudit.cfg (120 bytes, fnv cbc80e32e98b4190)
       + # audit settings of INST1
       + active = yes
       + errortype = normal
       + admin = both
       + instance = both
       + # upgraded for copy KXL101
file + C:\Program Files\ZAV\KXL101\function\kxludf.dll (42 bytes, fnv d5018ea7f0c59122)
       + MZ user functions of the KXL95 instances
file + C:\upgrade.log (62 bytes, fnv 9b1eb0d4870202bd)
       + Database check of instance "INST1" finished.
       + Result code: 0
file + events.jsonl (805 bytes, fnv d398b08fdd4bb417)
       + {"KXLINSTANCE":"INST1","argc":"7","args":"-h -m -not1 -l C:\\upgrade.log -t C:","cwd":"C:\\","event":"program","program":"kxlckupgrade.exe"}
       + {"KXLINSTANCE":"INST1","argc":"0","args":"","cwd":"C:\\","event":"program","program":"kxlimaudcfg.exe"}
       + {"KXLINSTANCE":"INST1","argc":"4","args":"-c C:\\Program Files\\ZAV\\KXL95\\INST1\\SSLClientconfig.ini -s C:\\Program Files\\ZAV\\KXL95\\INST1\\SSLconfig.ini","cwd":"C:\\","event":"program","program":"kxlimsslcfg.exe"}
       + {"KXLINSTANCE":"INST1","argc":"1","args":"-cleanup","cwd":"C:\\","event":"program","program":"kxlset.exe"}
       + {"audit_event":"53","category":"0x80000000","errortype":"0","event":"audit","instance":"INST1","sqlcode":"0"}
       + {"audit_event":"1","category":"0x20000000","data":"INST1","errortype":"0","event":"audit","instance":"INST1","sqlcode":"0"}
)";

using UpgradeE2eTest = kxltest::CommandWorld;

// A diff without the entry of the diagnostic log and its lines.
std::string withoutDiagnosticLog(const std::string &diff) {
  std::istringstream lines(diff);
  std::string kept;
  bool inLog = false;
  for (std::string line; std::getline(lines, line);) {
    if (!line.empty() && line[0] != ' ')
      inLog = line.rfind("file + kxldiag.log", 0) == 0;
    if (!inLog)
      kept += line + "\n";
  }
  return kept;
}

// The converted file has the current release's layout: release word 0x0D00
// at byte 16, level 10100 at byte 20, and 16384 bytes.
void expectCurrentLayout(const std::string &path) {
  std::ifstream in(path, std::ios::binary);
  std::vector<unsigned char> image((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
  ASSERT_EQ(image.size(), 16384u);
  EXPECT_EQ(image[16] | image[17] << 8, 0x0D00);
  EXPECT_EQ(image[20] | image[21] << 8 | image[22] << 16 | image[23] << 24, 10100);
}

TEST_F(UpgradeE2eTest, SinglePartitionInstanceMovesToTheCurrentCopy) {
  std::string before = snapshot();
  kxltest::CommandOutcome upgrade = runInWorld({"INST1"}, {}, "kxliupgrade.exe", "C:\\");
  EXPECT_EQ(upgrade.exitCode, 0) << upgrade.out << upgrade.err;
  EXPECT_NE(upgrade.out.find("KXLIUPGRADE"), std::string::npos) << upgrade.out;

  std::string diff = changesSince(before);
  // The diagnostic log names the backup folder, whose name differs per run.
  EXPECT_EQ(withoutDiagnosticLog(diff), kExpectedChanges);
  EXPECT_NE(diff.find("\\INST1 is backed up in C:\\windows\\temp\\KXL"), std::string::npos) << diff;
  expectCurrentLayout(hostPath(std::string(kCurrentCopy) + "\\INST1\\kxlsystm"));
}

} // namespace
