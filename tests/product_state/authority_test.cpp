// Who runs the program: administrator bits, authorization ID, content extender.
#include "tests/support/product_world.h"

namespace {

using AuthorityTest = kxltest::ProductWorld;

TEST_F(AuthorityTest, AdministratorBitsAndContentExtenderComeFromTheIdentity) {
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

TEST_F(AuthorityTest, AuthorizationIdPrefersTheIdentityOverTheLogonName) {
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
