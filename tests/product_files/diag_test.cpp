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

TEST_F(Tracing, EveryHookWritesOneLine) {
  traceTo(tracePath_.c_str());
  int32_t value = -5;
  uint32_t unsignedValue = 40;
  int64_t wide = 1LL << 40;
  const unsigned char bytes[] = {0x00, 0xAB, 0x10};
  pdtEntry(0x18780502);
  pdtError(0x18780502, 50, -1969);
  pdtData1(0x18780502, 7, PD_TYPE_STRING, 0, "C:\\inst\nINST1");
  pdtData2(0x1878050A, 8, PD_TYPE_INT32, 4, &value, PD_TYPE_UINT32, 4, &unsignedValue);
  pdtData1(0x1, 9, PD_TYPE_INT64, 8, &wide);
  sqltData2(0x2, 3, sizeof bytes, bytes, 0, nullptr);
  pdFlightRecordTrc(0x3, 4, "note");
  pdtEntry1(0x4, PD_TYPE_STRING, 0, "arg");
  pdtExit1(0x4, 0, 0, PD_TYPE_INT32, 4, &value);
  sqltError(0x5, 2, -1);
  pdtExit(0x18780502, -1969, 0);
  EXPECT_EQ("entry 0x18780502\n"
            "error 0x18780502 probe=50 rc=-1969\n"
            "data 0x18780502 probe=7 C:\\inst INST1\n"
            "data 0x1878050A probe=8 -5 40\n"
            "data 0x00000001 probe=9 1099511627776\n"
            "data 0x00000002 probe=3 00AB10\n"
            "data 0x00000003 probe=4 note\n"
            "entry 0x00000004 arg\n"
            "exit 0x00000004 rc=0 -5\n"
            "error 0x00000005 probe=2 rc=-1\n"
            "exit 0x18780502 rc=-1969\n",
            kxltestsupport::readHostFile(tracePath_));
}

TEST_F(Tracing, LongDataIsCutAndTheLineStaysWhole) {
  traceTo(tracePath_.c_str());
  std::string longText(5000, 'x');
  pdtData1(0x1, 1, PD_TYPE_STRING, 0, longText.c_str());
  pdtExit(0x1, 0, 0);
  std::string text = kxltestsupport::readHostFile(tracePath_);
  size_t firstEnd = text.find('\n');
  ASSERT_NE(std::string::npos, firstEnd);
  EXPECT_LT(firstEnd, 1024u);
  EXPECT_EQ("exit 0x00000001 rc=0\n", text.substr(firstEnd + 1));
}

TEST_F(Tracing, NothingIsWrittenWithoutTheSetting) {
  traceTo(nullptr);
  pdtEntry(0x1);
  pdtExit(0x1, 0, 0);
  EXPECT_FALSE(std::filesystem::exists(tracePath_));
}

TEST_F(Tracing, DiagnosticLogLiesBesideTheEventLog) {
  std::string events = kxlsim::eventsPath();
  std::string log = kxlprod::diagnosticLogPath();
  ASSERT_FALSE(log.empty());
  EXPECT_EQ(events.substr(0, events.find_last_of("/\\")), log.substr(0, log.find_last_of("/\\")));
  EXPECT_EQ(0, pdLog(PD_LEVEL_WARNING, 0x18780001, 10, 1168, "ODBC status %d", 1168));
  EXPECT_EQ(0, pdLog(PD_LEVEL_INFO, 0x18780001, 11, 0, "%s", "two\nlines"));
  EXPECT_EQ("level=3 function=0x18780001 probe=10 rc=1168 ODBC status 1168\n"
            "level=4 function=0x18780001 probe=11 rc=0 two lines\n",
            kxltestsupport::readHostFile(log));
  failCalls("pdLog:1");
  EXPECT_NE(0, pdLog(PD_LEVEL_INFO, 1, 1, 0, "dropped"));
}

} // namespace
