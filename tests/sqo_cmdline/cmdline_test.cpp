// parseCommandLine in a temporary world: options, values, codes.
#include "engn/sqo/cmdline.h"
#include "tests/support/product_world.h"

#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

#ifndef _WIN32
#include <filesystem>
#include <unistd.h>
#endif

namespace {

using Args = std::vector<std::string>;

class CommandLine : public kxltest::ProductWorld {
protected:
  // Parses "KXLIUPGRADE" followed by `args` into a cleared record.
  int parse(std::vector<std::string> args) {
    args.insert(args.begin(), "KXLIUPGRADE");
    std::vector<const char *> argv;
    for (const std::string &arg : args)
      argv.push_back(arg.c_str());
    argv.push_back(nullptr);
    std::memset(&options, 0, sizeof options);
    return parseCommandLine(int(args.size()), argv.data(), &options);
  }

  UpgradeOptions options{};
};

TEST_F(CommandLine, NoArgumentsAndHelpAreUsage) {
  const char *alone[] = {"KXLIUPGRADE", nullptr};
  EXPECT_EQ(UPGRADE_RC_USAGE, parseCommandLine(1, alone, &options));
  EXPECT_EQ(UPGRADE_RC_USAGE, parseCommandLine(0, nullptr, &options));
  // The last: options without an instance name.
  for (const std::vector<std::string> &args :
       {Args{"-?"}, Args{"INST1", "-?"}, Args{"INST1", "/?"}, Args{"-q"}})
    EXPECT_EQ(UPGRADE_RC_USAGE, parse(args)) << args.back();
}

TEST_F(CommandLine, OptionWordsPrefixAndCase) {
  for (const char *quiet : {"/q", "-Q", "-quack"}) { // only the option letter decides
    EXPECT_EQ(0, parse({quiet, "inst1"})) << quiet;
    EXPECT_EQ(1, options.quiet) << quiet;
  }

  EXPECT_EQ(0, parse({"inst1", "-INSTALL", "/forcecn"}));
  EXPECT_EQ(UPGRADE_FLAG_INSTALLER | UPGRADE_FLAG_FORCE_COPY_NAME, options.flags);
  EXPECT_EQ(0, parse({"inst1", "-installer"}));
  EXPECT_EQ(UPGRADE_FLAG_INSTALLER, options.flags);

  for (const char *unknown : {"-inst", "-force", "-x", "-"}) // the first two: shorter than the option word
    EXPECT_EQ(UPGRADE_RC_USAGE, parse({"inst1", unknown})) << unknown;
}

TEST_F(CommandLine, InstanceNameLengthCaseAndCount) {
  EXPECT_EQ(0, parse({"inst1"}));
  EXPECT_STREQ("INST1", options.instanceName);
  EXPECT_EQ(0, parse({"abcdefgh"}));
  EXPECT_STREQ("ABCDEFGH", options.instanceName);
  EXPECT_EQ(UPGRADE_RC_BAD_INSTANCE_NAME, parse({"abcdefghi"}));
  EXPECT_STREQ("", options.instanceName) << "a refused name is not stored";
  EXPECT_EQ(UPGRADE_RC_BAD_INSTANCE_NAME, parse({"1inst"})) << "refused by the name check";
  EXPECT_EQ(UPGRADE_RC_BAD_INSTANCE_NAME, parse({""}));
  EXPECT_EQ(UPGRADE_RC_USAGE, parse({"inst1", "inst2"}));
}

TEST_F(CommandLine, AuthTypeWords) {
  struct Case {
    const char *typed;
    uint16_t code;
  };
  const Case cases[] = {{"server", 0},
                        {"client", 1},
                        {"server_encrypt", 4},
                        {"dcs", 2},
                        {"dce", 3},
                        {"dcs_encrypt", 5},
                        {"dce_server_encrypt", 6},
                        {"kerberos", 7},
                        {"kerberos_server_encrypt", 8}};
  for (const Case &c : cases) {
    ASSERT_EQ(0, parse({"-a", c.typed, "inst1"})) << c.typed;
    EXPECT_EQ(c.code, options.authType) << c.typed;
    EXPECT_TRUE(options.flags & UPGRADE_FLAG_AUTH_TYPE) << c.typed;
  }
  EXPECT_STREQ("kerberos_server_enc", options.authTypeName) << "kept to its first 19 characters";

  EXPECT_EQ(0, parse({"-a:CLIENT", "-a", "DCE", "inst1"}));
  EXPECT_EQ(UPGRADE_AUTH_DCE, options.authType) << "a later -a replaces an earlier one";
  EXPECT_STREQ("DCE", options.authTypeName);

  EXPECT_EQ(UPGRADE_RC_USAGE, parse({"-a", "LDAP", "inst1"}));
  EXPECT_EQ(0, options.flags & UPGRADE_FLAG_AUTH_TYPE);
  EXPECT_EQ(UPGRADE_RC_USAGE, parse({"inst1", "-a"}));
  EXPECT_EQ(UPGRADE_RC_USAGE, parse({"-a", "", "inst1"}));
}

TEST_F(CommandLine, ProfilePathMustBeADirectory) {
  makeDirectories("C:\\Profiles\\New");
  EXPECT_EQ(0, parse({"-p", "C:\\Profiles\\New", "inst1"}));
  EXPECT_STREQ("C:\\Profiles\\New", options.profilePath);

#ifndef _WIN32
  std::filesystem::create_directories(std::filesystem::path(worldRoot()) / "drive_d");
  EXPECT_EQ(0, parse({"-p", "D:\\", "inst1"}));
  EXPECT_STREQ("D:", options.profilePath) << "a drive root loses its backslash";
#endif
  EXPECT_EQ(UPGRADE_RC_BAD_PROFILE_PATH, parse({"-p", "Q:\\", "inst1"}));

  writeFile("C:\\Profiles\\note.txt", std::string());
  EXPECT_EQ(UPGRADE_RC_BAD_PROFILE_PATH, parse({"-p", "C:\\Profiles\\note.txt", "inst1"}));
  EXPECT_EQ(UPGRADE_RC_BAD_PROFILE_PATH, parse({"-p", "C:\\Profiles\\Missing", "inst1"}));
  EXPECT_EQ(UPGRADE_RC_USAGE, parse({"inst1", "-p"}));
}

TEST_F(CommandLine, AccountNameAndPassword) {
  EXPECT_EQ(0, parse({"-u", "svcuser,secret", "inst1"}));
  EXPECT_STREQ("svcuser", options.userName);
  EXPECT_STREQ("secret", options.password);
  EXPECT_EQ(0, parse({"-u", "svcuser", "inst1"}));
  EXPECT_STREQ("svcuser", options.userName);
  EXPECT_STREQ("", options.password);
  EXPECT_EQ(0, parse({"-u", "a,b,c", "inst1"})) << "only the first comma separates";
  EXPECT_STREQ("b,c", options.password);

  std::string name31(31, 'n');
  EXPECT_EQ(UPGRADE_RC_BAD_ACCOUNT, parse({"-u", name31, "inst1"}));
  EXPECT_EQ(0, parse({"-u", name31 + ",pw", "inst1"}));
  EXPECT_EQ(std::string(30, 'n'), options.userName);
  EXPECT_EQ(0, parse({"-u", "x," + std::string(300, 'p'), "inst1"}));
  EXPECT_EQ(std::string(255, 'p'), options.password);
  EXPECT_EQ(UPGRADE_RC_USAGE, parse({"inst1", "-u"}));
}

TEST_F(CommandLine, FailedPasswordPromptIsAnAccountError) {
  failCalls("sqlo_get_password:1");
  testing::internal::CaptureStdout();
  EXPECT_EQ(UPGRADE_RC_BAD_ACCOUNT, parse({"-u", "svcuser,", "inst1"}));
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
  int rc = parse({"-u", "svcuser,", "inst1"});
  std::string prompt = testing::internal::GetCapturedStdout();
  dup2(savedInput, 0);
  close(savedInput);
  EXPECT_EQ(0, rc);
  EXPECT_STREQ("s3cret", options.password);
  EXPECT_NE(std::string::npos, prompt.find("svcuser")) << prompt;
}
#endif

TEST_F(CommandLine, TextSearchForms) {
  const struct {
    const char *value, *service;
    uint16_t port;
  } cases[] = {{"text_search", "", 0},
               {"TEXT_SEARCH,65535", "", 65535},
               {"TEXT_SEARCH,1024", "", 1024},
               {"TEXT_SEARCH,tsvc", "tsvc", 0},
               {"TEXT_SEARCH,abcdefghijklmn", "abcdefghijklmn", 0},
               {"TEXT_SEARCH,tsvc,55000", "tsvc", 55000},
               {"TEXT_SEARCH,,55000", "", 55000}}; // the service may be empty
  for (const auto &c : cases) {
    ASSERT_EQ(0, parse({"-j", c.value, "inst1"})) << c.value;
    EXPECT_EQ(1, options.partitionRecord.textSearchRequested) << c.value;
    EXPECT_STREQ(c.service, options.partitionRecord.textSearchService) << c.value;
    EXPECT_EQ(c.port, options.partitionRecord.textSearchPort) << c.value;
  }
  EXPECT_EQ(0, parse({"-j:TEXT_SEARCH,2000", "inst1"}));
  EXPECT_EQ(2000, options.partitionRecord.textSearchPort);
}

TEST_F(CommandLine, TextSearchOutOfRangeOrRefused) {
  // An empty port is 0; one that overflows 32 bits must not wrap into the range.
  for (const char *value :
       {"TEXT_SEARCH,1023", "TEXT_SEARCH,65536", "TEXT_SEARCH,", "TEXT_SEARCH,4294967297",
        "TEXT_SEARCH,abcdefghijklmno", "TEXT_SEARCH,abcdefghijklmno,5000", "TEXT_SEARCH,tsvc,70000"}) {
    EXPECT_EQ(UPGRADE_RC_TEXT_SEARCH_RANGE, parse({"-j", value, "inst1"})) << value;
    EXPECT_EQ(0, options.partitionRecord.textSearchRequested) << value;
  }
  // The keyword is needed whole.
  for (const char *value : {"TEXT_SEARCH,tsvc,0", "TEXT_SEARCH,tsvc,5000ab", "TEXT_SEARCH,tsvc,",
                            "TEXT_SEARCH,tsvc,50,60", "FULL_TEXT", "TEXT,5000", ",5000", ""})
    EXPECT_EQ(UPGRADE_RC_BAD_TEXT_SEARCH, parse({"-j", value, "inst1"})) << value;
  EXPECT_EQ(UPGRADE_RC_BAD_TEXT_SEARCH, parse({"inst1", "-j"}));
}

TEST_F(CommandLine, RepeatedTextSearchIsRefused) {
  EXPECT_EQ(UPGRADE_RC_BAD_TEXT_SEARCH, parse({"-j", "TEXT_SEARCH,3000", "-j", "TEXT_SEARCH,4000", "inst1"}));
  EXPECT_EQ(3000, options.partitionRecord.textSearchPort) << "the first setting is not overwritten";
  EXPECT_EQ(UPGRADE_RC_BAD_TEXT_SEARCH, parse({"-j", "TEXT_SEARCH", "-j", "TEXT_SEARCH", "inst1"}));
}

TEST_F(CommandLine, AdministrationServerInstanceIsRefused) {
  setString("SOFTWARE\\ZAV\\KXLSIM\\AdminServer", "Name", "KXLDAS00");
  makeDirectories("C:\\Profiles");
  EXPECT_EQ(UPGRADE_RC_ADMIN_SERVER,
            parse({"-q", "-p", "C:\\Profiles", "-u", "svc,pw", "-j", "TEXT_SEARCH", "kxldas00"}));
  EXPECT_EQ(0, parse({"kxldas0"}));
  EXPECT_EQ(0, parse({"inst1"}));
}

TEST_F(CommandLine, FirstErrorStopsAndKeepsEarlierFields) {
  EXPECT_EQ(UPGRADE_RC_BAD_INSTANCE_NAME, parse({"-q", "-a", "client", "toolongname", "-install"}));
  EXPECT_EQ(1, options.quiet);
  EXPECT_EQ(UPGRADE_AUTH_CLIENT, options.authType);
  EXPECT_EQ(0, options.flags & UPGRADE_FLAG_INSTALLER) << "arguments after the error are not read";
}

} // namespace
