// Status blocks and who runs the program:
// administrator bits, authorization ID, content extender.
#include "tests/support/product_world.h"

#include <string>

namespace {

using SetupTest = kxltest::ProductWorld;

TEST_F(SetupTest, InitialisedBlockCarriesItsIdAndSizeAndTheProducerTagIsBlankPadded) {
  sqlca ca;
  std::memset(&ca, 0x5A, sizeof ca);
  sqloinca(&ca);
  EXPECT_EQ(std::string(reinterpret_cast<const char *>(&ca), 16),
            std::string("SQLCA   \x88\0\0\0\0\0\0\0", 16)); // id, size 136, sqlcode 0
  EXPECT_EQ(ca.sqlerrml, 0);
  EXPECT_EQ(ca.sqlerrp[0], '\0');
  sqlcaSetProducer(ca, "AB");
  EXPECT_EQ(std::string(ca.sqlerrp, 8), "AB      ");
}

TEST_F(SetupTest, TokensAreJoinedBySeparatorAndCutToTheField) {
  sqlca ca;
  sqloinca(&ca);
  std::string longToken(100, 'T');
  const char *two[] = {"USER1", "X"}, *one[] = {longToken.c_str()};
  const uint64_t three[] = {3};
  ASSERT_EQ(0, sqlegsca(-1092, 2, nullptr, two, &ca));
  EXPECT_EQ(ca.sqlcode, -1092);
  EXPECT_EQ(std::string(ca.sqlerrmc, ca.sqlerrml), std::string("USER1\xFFX"));
  ASSERT_EQ(0, sqlegsca(-1092, 1, three, two, &ca));
  EXPECT_EQ(std::string(ca.sqlerrmc, ca.sqlerrml), "USE") << "a token length shorter than the text limits it";
  ASSERT_EQ(0, sqlegsca(-1092, 1, nullptr, one, &ca));
  EXPECT_EQ(ca.sqlerrml, 70);
  EXPECT_EQ(std::string(ca.sqlerrp, 8), std::string(8, '\0')) << "tokens must stay inside sqlerrmc";
}

TEST_F(SetupTest, ResultCodesBecomeSqlcodesWithTheProducerTag) {
  sqlca ca;
  sqloinca(&ca);
  ASSERT_EQ(0, sqlzRcToSqlca(0, &ca, "KXLIUPGRADE", -1403, 0, 0));
  EXPECT_EQ(ca.sqlcode, -1403);
  EXPECT_EQ(std::string(ca.sqlerrp, 8), "KXLIUPGR");
  // A library code is no SQLCODE: it is reported as a system error naming the code.
  ASSERT_EQ(0, sqlzRcToSqlca(0, &ca, "KXLIUPGRADE", SQLO_RC_IO_ERROR, 0, 0));
  EXPECT_EQ(ca.sqlcode, -1042);
  EXPECT_EQ(std::string(ca.sqlerrmc, ca.sqlerrml), "0x870F0004");
}

TEST_F(SetupTest, InjectedFaultsFailTheNamedCallOnly) {
  failCalls("sqlegsca:2,ossOneTimeOnly:1");
  EXPECT_NE(0u, ossOneTimeOnly());
  EXPECT_EQ(0u, ossOneTimeOnly());
  sqlca ca;
  sqloinca(&ca);
  EXPECT_EQ(0, sqlegsca(-1, 0, nullptr, nullptr, &ca));
  EXPECT_NE(0, sqlegsca(-2, 0, nullptr, nullptr, &ca));
  EXPECT_EQ(ca.sqlcode, -1) << "a failed call leaves the block alone";
}

TEST_F(SetupTest, AdministratorBitsAndContentExtenderComeFromTheIdentity) {
  EXPECT_EQ(0, sqloIsLocalAdmin()) << "a machine that records nothing has an ordinary user";
  EXPECT_EQ(0, sqloIsContentExtenderInstalled("C:\\KXL"));
  setDword(kIdentity, "LocalAdmin", 0x14);
  setDword(kIdentity, "ContentExtender", 1);
  EXPECT_EQ(0x14, sqloIsLocalAdmin());
  EXPECT_NE(0, sqloIsContentExtenderInstalled("C:\\KXL"));
  EXPECT_EQ(0, sqloIsContentExtenderInstalled(nullptr));
  setString(kIdentity, "LocalAdmin", "yes");
  EXPECT_LT(sqloIsLocalAdmin(), 0) << "a value of the wrong type is a failure, not an answer";
  failCalls("sqloIsLocalAdmin:1,sqloIsContentExtenderInstalled:1");
  EXPECT_LT(sqloIsLocalAdmin(), 0);
  EXPECT_EQ(0, sqloIsContentExtenderInstalled("C:\\KXL"));
}

TEST_F(SetupTest, AuthorizationIdPrefersTheIdentityOverTheLogonName) {
  char id[SQLE_AUTHID_SZ];
  kxltest::setProcessVariable("USERNAME", "logonuser");
  EXPECT_EQ(1, sqleget_authid(id));
  EXPECT_STREQ("logonuser", id);
  setString(kIdentity, "AuthId", std::string(300, 'A'));
  EXPECT_EQ(0, sqleget_authid(id));
  EXPECT_EQ(std::string(SQLE_AUTHID_SZ - 1, 'A'), id) << "the ID is cut to the buffer";
  setString(kIdentity, "AuthId", "");
  kxltest::setProcessVariable("USERNAME", nullptr);
  EXPECT_LT(sqleget_authid(id), 0);
  EXPECT_STREQ("", id);
  failCalls("sqleget_authid:1");
  EXPECT_LT(sqleget_authid(id), 0);
}

} // namespace
