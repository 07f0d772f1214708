// parseCommandLine in a temporary world: options, values, codes. Each row is
// a command line and what the parse gives: its code and the record's fields.
#include "engn/sqo/cmdline.h"
#include "tests/support/product_world.h"

#include <gtest/gtest.h>

#include <cstring>
#include <sstream>
#include <string>
#include <vector>

#ifndef _WIN32
#include <filesystem>
#include <unistd.h>
#endif

namespace {

class CommandLine : public kxltest::ProductWorld {
protected:
  // Parses "KXLIUPGRADE" and the words of `line` ('' an empty word) into a
  // cleared record.
  int parse(const std::string &line) {
    std::vector<std::string> args{"KXLIUPGRADE"};
    std::istringstream words(line);
    for (std::string word; words >> word;)
      args.push_back(word == "''" ? "" : word);
    std::vector<const char *> argv;
    for (const std::string &arg : args)
      argv.push_back(arg.c_str());
    argv.push_back(nullptr);
    std::memset(&options, 0, sizeof options);
    return parseCommandLine(int(args.size()), argv.data(), &options);
  }

  // The fields a parse set: instance, q, install, forcecn, a=<code>:<name>,
  // p=<path>, u=<user>,<password>, j=<service>:<port>.
  std::string fields() const {
    std::string out = options.instanceName;
    auto add = [&out](bool set, const std::string &field) {
      if (set)
        out += (out.empty() ? "" : " ") + field;
    };
    add(options.quiet != 0, "q");
    add((options.flags & UPGRADE_FLAG_INSTALLER) != 0, "install");
    add((options.flags & UPGRADE_FLAG_FORCE_COPY_NAME) != 0, "forcecn");
    add((options.flags & UPGRADE_FLAG_AUTH_TYPE) != 0,
        "a=" + std::to_string(options.authType) + ":" + options.authTypeName);
    add(options.profilePath[0] != '\0', std::string("p=") + options.profilePath);
    add(options.userName[0] != '\0', std::string("u=") + options.userName + "," + options.password);
    const PartitionRecord &record = options.partitionRecord;
    add(record.textSearchRequested != 0,
        std::string("j=") + record.textSearchService + ":" + std::to_string(record.textSearchPort));
    return out;
  }

  UpgradeOptions options{};
};

TEST_F(CommandLine, EveryOptionAndItsRefusals) {
  makeDirectories("C:\\Profiles\\New");
  writeFile("C:\\Profiles\\note.txt", std::string());
  setString("SOFTWARE\\ZAV\\KXLSIM\\AdminServer", "Name", "KXLDAS00");
  const struct {
    const char *lines; // command lines with the same outcome, '|' between them
    int rc;
    const char *fields; // null: not looked at
  } rows[] = {
      // Usage: help, options without an instance name or value, unknown
      // options and types (-inst and -force shorter than the option word), a
      // second instance name.
      {"|-?|-a LDAP inst1|-a '' inst1", UPGRADE_RC_USAGE, ""},
      {"-q", UPGRADE_RC_USAGE, "q"},
      {"INST1 -?|INST1 /?|inst1 -inst|inst1 -force|inst1 -x|inst1 -|inst1 inst2|inst1 -a|inst1 -p|inst1 -u",
       UPGRADE_RC_USAGE, "INST1"},
      // Only the option letter decides; option words take any case.
      {"/q inst1|-Q inst1|-quack inst1", 0, "INST1 q"},
      {"inst1 -INSTALL /forcecn", 0, "INST1 install forcecn"},
      {"inst1 -installer", 0, "INST1 install"},
      // Instance names: at most 8 characters, upper-cased; a refused name is
      // not stored.
      {"abcdefgh", 0, "ABCDEFGH"},
      {"abcdefghi", UPGRADE_RC_BAD_INSTANCE_NAME, ""},
      {"1inst", UPGRADE_RC_BAD_INSTANCE_NAME, nullptr},
      {"''", UPGRADE_RC_BAD_INSTANCE_NAME, ""},
      // Authentication types; the name is kept to its first 19 characters and
      // a later -a replaces an earlier one.
      {"-a server inst1", 0, "INST1 a=0:server"},
      {"-a client inst1", 0, "INST1 a=1:client"},
      {"-a server_encrypt inst1", 0, "INST1 a=4:server_encrypt"},
      {"-a dcs inst1", 0, "INST1 a=2:dcs"},
      {"-a dce inst1", 0, "INST1 a=3:dce"},
      {"-a dcs_encrypt inst1", 0, "INST1 a=5:dcs_encrypt"},
      {"-a dce_server_encrypt inst1", 0, "INST1 a=6:dce_server_encrypt"},
      {"-a kerberos inst1", 0, "INST1 a=7:kerberos"},
      {"-a kerberos_server_encrypt inst1", 0, "INST1 a=8:kerberos_server_enc"},
      {"-a:CLIENT -a DCE inst1", 0, "INST1 a=3:DCE"},
      // The profile path must be a directory.
      {"-p C:\\Profiles\\New inst1", 0, "INST1 p=C:\\Profiles\\New"},
      {"-p Q:\\ inst1|-p C:\\Profiles\\note.txt inst1|-p C:\\Profiles\\Missing inst1",
       UPGRADE_RC_BAD_PROFILE_PATH, nullptr},
      // Account and password: only the first comma separates.
      {"-u svcuser,secret inst1", 0, "INST1 u=svcuser,secret"},
      {"-u svcuser inst1", 0, "INST1 u=svcuser,"},
      {"-u a,b,c inst1", 0, "INST1 u=a,b,c"},
      // Text search: the service may be empty, an empty port is 0, one that
      // overflows 32 bits must not wrap into the range.
      {"-j text_search inst1", 0, "INST1 j=:0"},
      {"-j TEXT_SEARCH,65535 inst1", 0, "INST1 j=:65535"},
      {"-j TEXT_SEARCH,1024 inst1", 0, "INST1 j=:1024"},
      {"-j TEXT_SEARCH,tsvc inst1", 0, "INST1 j=tsvc:0"},
      {"-j TEXT_SEARCH,abcdefghijklmn inst1", 0, "INST1 j=abcdefghijklmn:0"},
      {"-j TEXT_SEARCH,tsvc,55000 inst1", 0, "INST1 j=tsvc:55000"},
      {"-j TEXT_SEARCH,,55000 inst1", 0, "INST1 j=:55000"},
      {"-j:TEXT_SEARCH,2000 inst1", 0, "INST1 j=:2000"},
      {"-j TEXT_SEARCH,1023 inst1|-j TEXT_SEARCH,65536 inst1|-j TEXT_SEARCH, inst1|-j TEXT_SEARCH,4294967297 "
       "inst1|-j TEXT_SEARCH,abcdefghijklmno inst1|-j TEXT_SEARCH,abcdefghijklmno,5000 inst1|-j "
       "TEXT_SEARCH,tsvc,70000 inst1",
       UPGRADE_RC_TEXT_SEARCH_RANGE, ""},
      // The keyword is needed whole, once; the first setting is not overwritten.
      {"-j TEXT_SEARCH,tsvc,0 inst1|-j TEXT_SEARCH,tsvc,5000ab inst1|-j TEXT_SEARCH,tsvc, inst1|-j "
       "TEXT_SEARCH,tsvc,50,60 inst1|-j FULL_TEXT inst1|-j TEXT,5000 inst1|-j ,5000 inst1|-j '' inst1",
       UPGRADE_RC_BAD_TEXT_SEARCH, ""},
      {"inst1 -j", UPGRADE_RC_BAD_TEXT_SEARCH, "INST1"},
      {"-j TEXT_SEARCH,3000 -j TEXT_SEARCH,4000 inst1", UPGRADE_RC_BAD_TEXT_SEARCH, "j=:3000"},
      {"-j TEXT_SEARCH -j TEXT_SEARCH inst1", UPGRADE_RC_BAD_TEXT_SEARCH, "j=:0"},
      // The administration server's instance is refused, whatever else is given.
      {"-q -p C:\\Profiles -u svc,pw -j TEXT_SEARCH kxldas00", UPGRADE_RC_ADMIN_SERVER, nullptr},
      {"kxldas0", 0, "KXLDAS0"},
      // The first error stops: arguments after it are not read.
      {"-q -a client toolongname -install", UPGRADE_RC_BAD_INSTANCE_NAME, "q a=1:client"},
  };
  for (const auto &row : rows) {
    std::istringstream lines(row.lines);
    for (std::string line; std::getline(lines, line, '|');) {
      EXPECT_EQ(row.rc, parse(line)) << line;
      EXPECT_TRUE(row.fields == nullptr || row.fields == fields()) << line << ": " << fields();
    }
  }
  EXPECT_EQ(UPGRADE_RC_USAGE, parseCommandLine(0, nullptr, &options));

  const std::string name31(31, 'n');
  EXPECT_EQ(UPGRADE_RC_BAD_ACCOUNT, parse("-u " + name31 + " inst1"));
  EXPECT_EQ(0, parse("-u " + name31 + ",pw inst1"));
  EXPECT_EQ("INST1 u=" + name31.substr(1) + ",pw", fields());
  EXPECT_EQ(0, parse("-u x," + std::string(300, 'p') + " inst1"));
  EXPECT_EQ("INST1 u=x," + std::string(255, 'p'), fields());
#ifndef _WIN32
  std::filesystem::create_directories(std::filesystem::path(worldRoot()) / "drive_d");
  EXPECT_EQ(0, parse("-p D:\\ inst1"));
  EXPECT_EQ("INST1 p=D:", fields()) << "a drive root loses its backslash";
#endif
}

TEST_F(CommandLine, FailedPasswordPromptIsAnAccountError) {
  failCalls("sqlo_get_password:1");
  testing::internal::CaptureStdout();
  EXPECT_EQ(UPGRADE_RC_BAD_ACCOUNT, parse("-u svcuser, inst1"));
  testing::internal::GetCapturedStdout();
}

#ifndef _WIN32
TEST_F(CommandLine, EmptyPasswordIsReadFromStandardInput) {
  int pipeEnds[2];
  ASSERT_EQ(0, pipe(pipeEnds));
  const char typed[] = "s3cret\n";
  ASSERT_EQ(ssize_t(sizeof typed - 1), write(pipeEnds[1], typed, sizeof typed - 1));
  close(pipeEnds[1]);
  int savedInput = dup(0);
  dup2(pipeEnds[0], 0);
  close(pipeEnds[0]);
  testing::internal::CaptureStdout();
  int rc = parse("-u svcuser, inst1");
  std::string prompt = testing::internal::GetCapturedStdout();
  dup2(savedInput, 0);
  close(savedInput);
  EXPECT_EQ(0, rc);
  EXPECT_EQ("INST1 u=svcuser,s3cret", fields());
  EXPECT_NE(std::string::npos, prompt.find("svcuser")) << prompt;
}
#endif

} // namespace
