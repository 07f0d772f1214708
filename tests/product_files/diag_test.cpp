// Diagnostics: the lines of the trace file, silence without KXLTRACE, and
// the diagnostic log beside the world's event log.
#include "sim/common/events.h"
#include "sim/product/diag.h"
#include "tests/support/product_world.h"

#include <gtest/gtest.h>

#include <filesystem>

namespace {

class Tracing : public kxltest::ProductWorld {
protected:
  void TearDown() override {
    traceTo(nullptr);
    ProductWorld::TearDown();
  }
  void traceTo(const char *path) {
    kxltest::setProcessVariable("KXLTRACE", path);
    kxlprod::resetTrace();
  }
  const std::string tracePath_ = world_.scratch("trace.txt"); // outside the world, gone with it
};

// Each hook writes one line; long data is cut and its line stays whole.
TEST_F(Tracing, EveryHookWritesOneLineAndNothingWithoutTheSetting) {
  traceTo(nullptr);
  pdtEntry(0x1);
  EXPECT_FALSE(std::filesystem::exists(tracePath_));
  traceTo(tracePath_.c_str());
  int32_t value = -5;
  uint32_t unsignedValue = 40;
  int64_t wide = 1LL << 40;
  const unsigned char bytes[] = {0x00, 0xAB, 0x10};
  pdtEntry(0x18780502);
  pdtError(0x18780502, 50, -1969);
  pdtData1(0x18780502, 7, PD_TYPE_STRING, 0, "C:\\inst\nINST1");
  pdtData1(0x1878050A, 8, PD_TYPE_INT32, 4, &value);
  pdtData1(0x1878050A, 8, PD_TYPE_UINT32, 4, &unsignedValue);
  pdtData1(0x1, 9, PD_TYPE_INT64, 8, &wide);
  pdtData1(0x2, 3, PD_TYPE_BYTES, sizeof bytes, bytes);
  pdtData1(0x1, 1, PD_TYPE_STRING, 0, std::string(5000, 'x').c_str());
  pdtExit(0x18780502, -1969, 0);
  EXPECT_EQ("entry 0x18780502\n"
            "error 0x18780502 probe=50 rc=-1969\n"
            "data 0x18780502 probe=7 C:\\inst INST1\n"
            "data 0x1878050A probe=8 -5\n"
            "data 0x1878050A probe=8 40\n"
            "data 0x00000001 probe=9 1099511627776\n"
            "data 0x00000002 probe=3 00AB10\n"
            "data 0x00000001 probe=1 " +
                std::string(256, 'x') +
                "\n"
                "exit 0x18780502 rc=-1969\n",
            kxltestsupport::readHostFile(tracePath_));
}

TEST_F(Tracing, DiagnosticLogLiesBesideTheEventLog) {
  std::string events = kxlsim::eventsPath();
  std::string log = kxlprod::diagnosticLogPath();
  ASSERT_FALSE(log.empty());
  EXPECT_EQ(events.substr(0, events.find_last_of("/\\")), log.substr(0, log.find_last_of("/\\")));
  EXPECT_EQ(0, pdLog(PD_LEVEL_WARNING, 0x18780001, 10, 1168, "ODBC status %d", 1168));
  EXPECT_EQ(0, pdLog(PD_LEVEL_INFO, 0x18780001, 11, 0, "%s", "two\nlines"));
  EXPECT_EQ(0, pdLog(PD_LEVEL_INFO, 0x1, 12, 0, "%s", std::string(5000, 'y').c_str()));
  const std::string head = "level=4 function=0x00000001 probe=12 rc=0 ";
  EXPECT_EQ("level=3 function=0x18780001 probe=10 rc=1168 ODBC status 1168\n"
            "level=4 function=0x18780001 probe=11 rc=0 two lines\n" +
                head + std::string(1022 - head.size(), 'y') + "\n",
            kxltestsupport::readHostFile(log));
  failCalls("pdLog:1");
  EXPECT_NE(0, pdLog(PD_LEVEL_INFO, 1, 1, 0, "dropped"));
}

} // namespace
