// Message catalogs: the MO reader on good, swapped and damaged images,
// placeholder filling, and the message service over a world's catalogs.
#include "sim/product/mocatalog.h"
#include "tests/support/product_world.h"

#include <gtest/gtest.h>

#include <cstring>

using kxlprod::MoCatalog;

namespace {

std::vector<unsigned char> hostFileBytes(const char *path) {
  std::string text = kxltestsupport::readHostFile(path);
  return std::vector<unsigned char>(text.begin(), text.end());
}

void put32le(std::vector<unsigned char> &image, size_t at, uint32_t value) {
  for (int i = 0; i < 4; ++i)
    image[at + i] = uint8_t(value >> (8 * i));
}

std::string lookup(const MoCatalog &catalog, const char *key) {
  std::string_view text;
  return catalog.find(key, text) ? std::string(text) : "<none>";
}

TEST(MoCatalog, ReadsBothByteOrders) {
  for (const char *path : {KXL_TESTCAT_LE, KXL_TESTCAT_BE}) {
    MoCatalog catalog;
    ASSERT_TRUE(catalog.load(hostFileBytes(path))) << path;
    EXPECT_EQ("KXL1951W  The instance \"<instance-name>\" was not found.", lookup(catalog, "KXL1951"));
    EXPECT_EQ("SQL0100W  No row was found.", lookup(catalog, "SQL0100W"));
    EXPECT_EQ("first form", lookup(catalog, "KXL0042")) << "plural entries give their first form";
    EXPECT_EQ("<none>", lookup(catalog, "KXL9999"));
    EXPECT_EQ("<none>", lookup(catalog, "KXL195")) << "keys match whole";
  }
}

TEST(MoCatalog, RefusesOrSurvivesDamagedImages) {
  std::vector<unsigned char> good = hostFileBytes(KXL_TESTCAT_LE);
  ASSERT_GT(good.size(), 28u);
  MoCatalog catalog;
  // Every truncation either fails to load or finds nothing outside the image.
  for (size_t cut = 0; cut < good.size(); cut += 7) {
    std::vector<unsigned char> part(good.begin(), good.begin() + cut);
    if (catalog.load(part))
      lookup(catalog, "KXL1951");
  }
  // A bad magic number, tables that do not fit, a table past the end: refused.
  for (auto [at, value] :
       {std::pair<size_t, uint32_t>{0, 0x12345678u}, {8, 0x20000000u}, {12, 0xFFFFFFF0u}}) {
    std::vector<unsigned char> damaged = good;
    put32le(damaged, at, value);
    EXPECT_FALSE(catalog.load(damaged)) << at;
  }
  // String offsets pointing past the end: the entry is skipped, no crash.
  std::vector<unsigned char> wildStrings = good;
  uint32_t originals =
      uint32_t(good[12]) | uint32_t(good[13]) << 8 | uint32_t(good[14]) << 16 | uint32_t(good[15]) << 24;
  uint32_t count = uint32_t(good[8]) | uint32_t(good[9]) << 8;
  for (uint32_t i = 0; i < count; ++i) {
    put32le(wildStrings, originals + 8 * i, 0x7FFFFFFFu);
    put32le(wildStrings, originals + 8 * i + 4, uint32_t(good.size() - 2));
  }
  ASSERT_TRUE(catalog.load(wildStrings));
  EXPECT_EQ("<none>", lookup(catalog, "KXL1951"));
}

TEST(Placeholders, TokensFillInOrderTheRestStaysAndOutputIsCut) {
  EXPECT_EQ(3u, kxlprod::countPlaceholders("A \"<first>\" and <second-one> and <third_x>"));
  const struct {
    const char *text;
    std::vector<std::string_view> tokens;
    const char *filled;
  } rows[] = {
      {"A \"<first>\" and <second-one> and <third_x>", {"1", "2"}, "A \"1\" and 2 and <third_x>\n"},
      {"A <first>", {}, "A <first>\n"},
      {"ends\n", {}, "ends\n"},                                   // a final line feed is not doubled
      {"a < b <> c <x y> <ok>\n", {"T"}, "a < b <> c <x y> T\n"}, // only names are placeholders
  };
  char out[128];
  for (const auto &row : rows) {
    kxlprod::fillPlaceholders(row.text, row.tokens, out, sizeof out);
    EXPECT_STREQ(row.filled, out) << row.text;
  }
  char small[8];
  std::memset(small, 'Z', sizeof small);
  EXPECT_EQ(7u, kxlprod::fillPlaceholders("<a><b>", {"12345", "67890"}, small, sizeof small));
  EXPECT_STREQ("1234567", small);
  char one[1] = {'Z'};
  EXPECT_EQ(0u, kxlprod::fillPlaceholders("text", {}, one, sizeof one));
  EXPECT_EQ('\0', one[0]);
}

class MessageService : public kxltest::ProductWorld {
protected:
  static constexpr const char *kInstall = "C:\\KXL101";
  void SetUp() override {
    ProductWorld::SetUp();
    useCopy("KXL101", kInstall);
  }
  void installCatalog(const char *language, const char *name, const char *hostMo) {
    writeFile(std::string(kInstall) + "\\msg\\" + language + "\\" + name,
              kxltestsupport::readHostFile(hostMo));
  }
  std::string message(const char *catalog, uint32_t number, const char *const *tokens = nullptr) {
    char buffer[SQLO_MSG_BUFFER_SZ];
    int32_t rc = 12345;
    int32_t result = sqlogmsg(catalog, number, nullptr, tokens, buffer, sizeof buffer, &rc, 0, 0, 0);
    if (result <= 0)
      return "<none>";
    EXPECT_EQ(0, rc);
    EXPECT_EQ(size_t(result), std::strlen(buffer));
    return buffer;
  }
};

// Without tokens placeholders stay with their quotes; a language without a
// usable catalog gets the English one.
TEST_F(MessageService, EnglishCatalogServesOtherLanguagesAndKeepsUnfilledPlaceholders) {
  installCatalog("en_US", "kxlinst.mo", KXL_TESTCAT_LE);
  setString(kIdentity, "Language", "de_DE");
  writeFile(std::string(kInstall) + "\\msg\\de_DE\\kxlinst.mo", "not a catalog");
  const std::string text = "KXL1951W  The instance \"<instance-name>\" was not found.\n";
  EXPECT_EQ(text, message("kxlinst.mo", 1951));
  EXPECT_EQ(text, message("kxlinst", 1951));
  failCalls("sqlogmsg:1");
  EXPECT_EQ("<none>", message("kxlinst.mo", 1951));
  EXPECT_EQ(text, message("kxlinst.mo", 1951));
}

// The command's own use (a prefix token with its length) is checked end to
// end by the scenarios; a missing token leaves its placeholder.
TEST_F(MessageService, MissingCatalogMessageOrTokenAndSmallBuffers) {
  EXPECT_EQ("<none>", message("kxlclp.mo", 1069));
  installCatalog("en_US", "kxlclp.mo", KXL_TESTCAT_BE);
  const char *cut[] = {"only", nullptr};
  EXPECT_EQ("KXL1069E  \"only\" ended with \"<exit-code>\".\n", message("kxlclp.mo", 1069, cut));
  char buffer[64] = "old";
  int32_t rc = 0;
  EXPECT_LE(sqlogmsg("kxlclp.mo", 1953, nullptr, nullptr, buffer, sizeof buffer, &rc, 0, 0, 0), 0);
  EXPECT_NE(0, rc);
  EXPECT_STREQ("", buffer);
  EXPECT_EQ(9, sqlogmsg("kxlclp.mo", 1069, nullptr, nullptr, buffer, 10, &rc, 0, 0, 0));
  EXPECT_STREQ("KXL1069E ", buffer) << "a small buffer gets a cut, terminated text";
}

TEST_F(MessageService, StatusBlockTextCarriesItsTokens) {
  installCatalog("en_US", "kxlsql.mo", KXL_TESTCAT_LE);
  sqlca ca;
  sqloinca(&ca);
  const char *id[] = {"JOE"};
  uint64_t lengths[] = {3};
  ASSERT_EQ(0, sqlegsca(-1092, 1, lengths, id, &ca));
  char buffer[SQLO_MSG_BUFFER_SZ];
  EXPECT_EQ(62, sqlaintp_api(buffer, sizeof buffer, 0, "kxlsql.mo", &ca));
  EXPECT_STREQ("SQL1092N  The user \"JOE\" lacks the authority for the command.\n", buffer);
  ca.sqlcode = 100;
  ca.sqlerrml = 0;
  EXPECT_GT(sqlaintp_api(buffer, sizeof buffer, 0, "kxlsql.mo", &ca), 0);
  EXPECT_STREQ("SQL0100W  No row was found.\n", buffer);
  ca.sqlcode = -100;
  EXPECT_LE(sqlaintp_api(buffer, sizeof buffer, 0, "kxlsql.mo", &ca), 0);
}

} // namespace
