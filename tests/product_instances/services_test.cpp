// Service configuration on this and other machines, the services file, host
// names and measures.
#include "demo_world.h"

#include <algorithm>
#include <cstring>

namespace kxltest {
namespace {

using Services = DemoWorld;

// Changes the start type (and the program) of a service, nothing else.
int32_t changeStart(const char *name, const char *machine, uint32_t start, const char *program = nullptr) {
  SQLO_SVC_OUT out{};
  return sqloChangeNTServiceConfig(name, machine, SQLO_SVC_NO_CHANGE, start, SQLO_SVC_NO_CHANGE, program,
                                   nullptr, nullptr, nullptr, nullptr, nullptr, nullptr, &out);
}

TEST_F(Services, QueryGivesTheStoredConfiguration) {
  SQLO_SVC_CONFIG config{};
  SQLO_SVC_OUT out{};
  ASSERT_EQ(0, sqloQueryNTServiceConfig("INST1", nullptr, &config, &out));
  EXPECT_EQ(config.startType, 2);
  EXPECT_STREQ(config.programPath, "C:\\Program Files\\ZAV\\KXL95\\bin\\kxlsyscs.exe");
  EXPECT_STREQ(config.displayName, "KXL - KXL95 - INST1");
  EXPECT_STREQ(config.account, "LocalSystem");
  ASSERT_EQ(0, sqloQueryNTServiceConfig("INST2-2", "WINSRV2", &config, &out));
  EXPECT_STREQ(config.account, ".\\kxlsvc");
  EXPECT_EQ(SQLO_RC_SVC_NOT_FOUND, sqloQueryNTServiceConfig("INST2-2", nullptr, &config, &out));
  EXPECT_EQ(SQLO_RC_MACHINE_UNREACHABLE, sqloQueryNTServiceConfig("INST1", "WINSRV9", &config, &out));
}

TEST_F(Services, ChangeTouchesOnlyWhatIsGiven) {
  snapshot();
  ASSERT_EQ(0, changeStart("INST1", nullptr, 3));
  EXPECT_EQ(diff(),
            "registry ~ HKLM\\SOFTWARE\\ZAV\\KXLSIM\\Services\\INST1 \"Start\": dword:2 -> dword:3\n");
  snapshot();
  ASSERT_EQ(0, changeStart("INST1", "WINSRV1", SQLO_SVC_NO_CHANGE));
  EXPECT_EQ(diff(), "") << "no change at all, the local computer by name";
  EXPECT_EQ(SQLO_RC_INVALID_ARGUMENT, changeStart("INST1", nullptr, 9));
}

TEST_F(Services, ChangeOnAnotherMachineGoesToItsSubtree) {
  SQLO_SVC_OUT out{};
  const char *program = "C:\\Program Files\\ZAV\\KXL101\\bin\\kxlsyscs.exe";
  ASSERT_EQ(0, sqloChangeNTServiceConfig("INST2-1", "WINSRV2", SQLO_SVC_NO_CHANGE, 4, SQLO_SVC_NO_CHANGE,
                                         program, nullptr, nullptr, nullptr, ".\\newacct", "pw-never-kept",
                                         "KXL - KXL101 - INST2-1", &out));
  std::string key = kRemote + kServices + "INST2-1";
  EXPECT_EQ(regString(key, "ImagePath"), program);
  EXPECT_EQ(getDword(key, "Start"), 4u);
  EXPECT_EQ(regString(key, "ObjectName"), ".\\newacct");
  EXPECT_EQ(regString(key, "DisplayName"), "KXL - KXL101 - INST2-1");
  EXPECT_EQ(getDword(key, "State"), 1u);
  EXPECT_FALSE(keyExists(kServices + "INST2-1")) << "nothing on this machine";
  EXPECT_EQ(SQLO_RC_MACHINE_UNREACHABLE, changeStart("INST2-1", "WINSRV9", 4, program));
  failCalls("sqloChangeNTServiceConfig:1");
  EXPECT_NE(0, changeStart("INST1", nullptr, 4));
  EXPECT_EQ(getDword(kServices + "INST1", "Start"), 2u);
  // An unreadable service key is a failure, never a missing service (which callers pass over).
  failCalls("RegOpenKeyExA:1");
  EXPECT_EQ(SQLO_RC_SYSTEM_ERROR, changeStart("INST1", nullptr, 4));
  EXPECT_EQ(getDword(kServices + "INST1", "Start"), 2u);
}

TEST_F(Services, RegisterCreatesOnceAndReportsAnExistingService) {
  SQLO_SVC_OUT out{};
  const char *program = "C:\\Program Files\\ZAV\\KXL101\\bin\\ctelock.exe";
  ASSERT_EQ(0, sqloRegisterNTService("WINSRV2", "KXLEXT - INST2-1", "KXLEXT - KXL101 - INST2-1", 0, program,
                                     0, ".\\kxlsvc", "secret", "kxlwint64.dll", &out));
  std::string key = kRemote + kServices + "KXLEXT - INST2-1";
  EXPECT_EQ(regString(key, "ImagePath"), program);
  EXPECT_EQ(getDword(key, "Start"), 3u) << "start type 0 registers a demand-started service";
  EXPECT_EQ(regString(key, "Password"), "<no value>");
  EXPECT_EQ(SQLO_RC_SVC_EXISTS, sqloRegisterNTService("WINSRV2", "KXLEXT - INST2-1", "x", 0, program, 0,
                                                      nullptr, nullptr, "kxlwint64.dll", &out));
}

TEST_F(Services, ServicesFileRangesAreReservedOnce) {
  char first[SQLO_PORT_TEXT_SZ] = {}, last[SQLO_PORT_TEXT_SZ] = {};
  snapshot();
  ASSERT_EQ(0, sqloUpdateServiceFile(3, "INST2", first, last));
  EXPECT_STREQ(first, "60000");
  EXPECT_STREQ(last, "60003");
  EXPECT_EQ(diff(), "") << "an existing range is only reported";
  ASSERT_EQ(0, sqloUpdateServiceFile(3, "NEWP", first, last));
  EXPECT_STREQ(first, "60004") << "the ports between INST2's entries count as used";
  EXPECT_STREQ(last, "60007");
  std::string changes = diff();
  EXPECT_EQ(changes.rfind("file ~ C:\\windows\\system32\\drivers\\etc\\services\n", 0), 0u) << changes;
  EXPECT_NE(changes.find("+ KXL_NEWP           60004/tcp\n"), std::string::npos) << changes;
  EXPECT_NE(changes.find("+ KXL_NEWP_END       60007/tcp\n"), std::string::npos) << changes;
  EXPECT_EQ(std::count(changes.begin(), changes.end(), '\n'), 3) << changes;
  EXPECT_EQ(SQLO_RC_INVALID_ARGUMENT, sqloUpdateServiceFile(1, "NEWP", first, last));
}

TEST_F(Services, HostNamesResolveOnlyWhenKnown) {
  char full[SQLO_HOSTNAME_SZ] = {};
  ASSERT_EQ(0, sqloPdbTcpIpResolveHostName("WINSRV2", full, 5, 1));
  EXPECT_STREQ(full, "winsrv2.zav.test");
  EXPECT_EQ(SQLO_RC_NOT_FOUND, sqloPdbTcpIpResolveHostName("winsrv3", full, 5, 1));
  EXPECT_STREQ(full, "");
  ASSERT_EQ(0, sqloPdbTcpIpGetFullHostName(full, 5));
  EXPECT_STREQ(full, "winsrv1.zav.test");
  char computer[16] = {};
  uint32_t size = 4;
  EXPECT_EQ(0, sqloGetComputerNameA(computer, &size));
  EXPECT_EQ(GetLastError(), DWORD(ERROR_MORE_DATA));
  size = sizeof computer;
  ASSERT_NE(0, sqloGetComputerNameA(computer, &size));
  EXPECT_STREQ(computer, "WINSRV1");
  EXPECT_EQ(size, 7u);
  failCalls("sqloGetComputerNameA:1,sqloPdbTcpIpGetFullHostName:1");
  EXPECT_EQ(0, sqloGetComputerNameA(computer, &size));
  EXPECT_EQ(GetLastError(), DWORD(ERROR_ACCESS_DENIED));
  EXPECT_NE(0, sqloPdbTcpIpGetFullHostName(full, 5));
}

TEST_F(Services, MeasuresAcceptTextAndDwords) {
  float value = 0;
  ASSERT_EQ(0, sqlocpum(&value));
  EXPECT_FLOAT_EQ(value, 4e-5f);
  ASSERT_EQ(0, sqloGetCommBandwidth(&value, 4));
  EXPECT_FLOAT_EQ(value, 100.0f);
  float bits = 2.5f;
  DWORD word = 0;
  std::memcpy(&word, &bits, sizeof word);
  setDword("SOFTWARE\\ZAV\\KXLSIM\\Identity", "CommBandwidth", word);
  ASSERT_EQ(0, sqloGetCommBandwidth(&value, 4));
  EXPECT_FLOAT_EQ(value, 2.5f);
  setString("SOFTWARE\\ZAV\\KXLSIM\\Identity", "CpuMeasure", "fast");
  EXPECT_NE(0, sqlocpum(&value));
  failCalls("sqloGetCommBandwidth:1");
  EXPECT_NE(0, sqloGetCommBandwidth(&value, 4));
}

TEST_F(Services, AssistantReportsItsMachineNameInsideASession) {
  CAPRO_REQUEST request{};
  CAPRO_RESULT result{};
  request.queryKind = CAPRO_QUERY_MACHINE_NAME;
  EXPECT_NE(0, caProIfQuery(&request, &result)) << "no session yet";
  ASSERT_EQ(0, caProIfInit());
  ASSERT_EQ(0, caProIfQuery(&request, &result));
  EXPECT_STREQ(request.machineName, "winsrv1.zav.test");
  EXPECT_EQ(0, caProIfTerm());
  EXPECT_NE(0, caProIfTerm());
  failCalls("caProIfInit:1");
  EXPECT_NE(0, caProIfInit());
}

} // namespace
} // namespace kxltest
