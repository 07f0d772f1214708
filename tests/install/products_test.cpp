// Installed products: detection by level marker and installer registration,
// derived product codes, and the product lists of both kinds of copy.
#include "install/installcopy.h"
#include "install/installedprod.h"
#include "install/producttable.h"
#include "install_world.h"

namespace {

using kxltest::InstallWorld;
using Names = std::vector<std::string>;

// The server row of the current-release table and the code the demo world's
// 10.1 copy registers it under (fourth group raised by one).
constexpr const char *kServerCode = "{6E1C2A40-9F3B-4D21-8A10-5B2C7D0E9A01}";
constexpr const char *kServerCodeNext = "{6E1C2A40-9F3B-4D21-8A11-5B2C7D0E9A01}";

class Products : public InstallWorld {
protected:
  static void marker(const std::string &installPath, const std::string &code) {
    writeFile(installPath + "\\cfg\\kxl" + code + ".lvl", std::string("x"));
  }

  // Each product as "code edition rank node-type key components...".
  static Names products(InstalledProdList &list) {
    Names all;
    for (InstalledProd *product : elements(list)) {
      char edition[129] = {};
      EXPECT_EQ(0u, product->GetEditionName(edition, sizeof edition));
      std::string line = std::string(product->GetInfo()->code) + " " + edition + " " +
                         std::to_string(product->GetRankNumber()) + " " +
                         std::to_string(product->GetSupportedNodeType()) + " " + product->GetInfo()->key;
      for (const std::string &component : strings(product->GetComponents()))
        line += " " + component;
      all.push_back(line);
    }
    return all;
  }

  char registered[KXLI_PRODUCT_CODE_SZ] = {}; // the code detectProduct found registered
};

TEST(ProductCodes, DeriveByRaisingTheFourthGroup) {
  char out[64] = {};
  ASSERT_TRUE(kxliDerivedCode(kServerCode, 1, out, sizeof out));
  EXPECT_STREQ(kServerCodeNext, out);
  ASSERT_TRUE(kxliDerivedCode("{00000000-0000-0000-00ff-000000000000}", 15, out, sizeof out));
  EXPECT_STREQ("{00000000-0000-0000-010E-000000000000}", out);
  // A sum above FFFF keeps its last four digits.
  ASSERT_TRUE(kxliDerivedCode("{00000000-0000-0000-FFFF-000000000000}", 1, out, sizeof out));
  EXPECT_STREQ("{00000000-0000-0000-0000-000000000000}", out);
  EXPECT_FALSE(kxliDerivedCode("{00000000-0000-FFFF-000000000000}", 1, out, sizeof out));
  EXPECT_FALSE(kxliDerivedCode("{00000000-0000-0000-FFFF-0000-00}", 1, out, sizeof out));
  EXPECT_FALSE(kxliDerivedCode(kServerCode, 1, out, 20));
}

TEST_F(Products, NeedTheMarkerAndTheInstallerRegistrationAtTheSameFolder) {
  registerInstaller(kServerCode, "C:\\K101\\");
  EXPECT_EQ(KXLI_DETECT_NONE, detectProduct("hpe", "C:\\K101", registered, false, false));
  marker("C:\\K101", "hpe");
  EXPECT_EQ(KXLI_DETECT_MAIN, detectProduct("hpe", "C:\\K101", registered, false, false));
  EXPECT_STREQ(kServerCode, registered);
  // A trailing backslash on the installation path changes nothing.
  EXPECT_EQ(KXLI_DETECT_MAIN, detectProduct("HPE", "c:\\k101\\", registered, false, false));
  // Registered for another folder: not this copy's product.
  marker("C:\\Other", "hpe");
  EXPECT_EQ(KXLI_DETECT_NONE, detectProduct("hpe", "C:\\Other", registered, false, false));
  // No row for the code.
  marker("C:\\K101", "zzz");
  EXPECT_EQ(KXLI_DETECT_NONE, detectProduct("zzz", "C:\\K101", registered, false, false));
  EXPECT_EQ(KXLI_DETECT_NONE, detectProduct(nullptr, "C:\\K101", registered, false, false));
}

TEST_F(Products, OfASecondCopyAreFoundUnderDerivedCodes) {
  marker("C:\\K95", "hpe");
  marker("C:\\K101", "hpe");
  registerInstaller(kServerCode, "C:\\K95\\");
  registerInstaller(kServerCodeNext, "C:\\K101\\");
  EXPECT_EQ(KXLI_DETECT_MAIN, detectProduct("hpe", "C:\\K101", registered, false, false));
  EXPECT_STREQ(kServerCodeNext, registered);
  // The sixteenth copy is beyond the derived codes tried.
  marker("C:\\K16", "hpe");
  registerInstaller("{6E1C2A40-9F3B-4D21-8A20-5B2C7D0E9A01}", "C:\\Elsewhere");
  registerInstaller("{6E1C2A40-9F3B-4D21-8A1F-5B2C7D0E9A01}", "C:\\K15");
  marker("C:\\K15", "hpe");
  EXPECT_EQ(KXLI_DETECT_MAIN, detectProduct("hpe", "C:\\K15", registered, false, false));
}

TEST_F(Products, TryTheColumnsOfTheRegistryView) {
  marker("C:\\K32", "hpe");
  // The 32-bit view's code counts only for a 32-bit view copy.
  registerInstaller("{6E1C2A40-9F3B-4D21-8A20-5B2C7D0E9A01}", "C:\\K32");
  EXPECT_EQ(KXLI_DETECT_NONE, detectProduct("hpe", "C:\\K32", registered, false, false));
  EXPECT_EQ(KXLI_DETECT_MAIN, detectProduct("hpe", "C:\\K32", registered, false, true));
  // The second package's code gives its own result.
  marker("C:\\K2", "hpe");
  registerInstaller("{6E1C2A41-9F3B-4D21-8A12-5B2C7D0E9A01}", "C:\\K2");
  EXPECT_EQ(KXLI_DETECT_SECOND, detectProduct("hpe", "C:\\K2", registered, false, false));
  EXPECT_STREQ("{6E1C2A41-9F3B-4D21-8A12-5B2C7D0E9A01}", registered);
}

TEST_F(Products, AreNotInstalledWhenTheMarkerPathIsTooLong) {
  std::string path = "C:\\" + std::string(239, 'p');
  ASSERT_EQ(242u, path.size()); // 242 + 3 + 11 = 256
  EXPECT_EQ(KXLI_DETECT_NONE, detectProduct("hpe", path.c_str(), registered, true, false));
  std::string shorter = "C:\\" + std::string(238, 'p');
  marker(shorter, "srv");
  EXPECT_EQ(KXLI_DETECT_V8, detectProduct("srv", shorter.c_str(), registered, true, false));
}

TEST_F(Products, OfTheVersion8InstallationNeedOnlyTheirMarker) {
  marker("C:\\SQLLIB", "srv");
  marker("C:\\SQLLIB", "txt");
  marker("C:\\SQLLIB", "qqq");
  EXPECT_EQ(KXLI_DETECT_V8, detectProduct("srv", "C:\\SQLLIB", registered, true, false));
  EXPECT_STREQ(kxliFindProductRow("srv", true)->productCode, registered);
  EXPECT_EQ(KXLI_DETECT_NONE, detectProduct("txt", "C:\\SQLLIB", registered, true, false));
  EXPECT_EQ(KXLI_DETECT_V8, detectProduct("qqq", "C:\\SQLLIB", registered, true, false));
  EXPECT_STREQ("", registered);
}

TEST_F(Products, OfACurrentCopyAreListedInTableOrder) {
  registerCopy("KXL101", "C:\\K101");
  for (const char *code : {"cli", "tlv", "hpe"})
    marker("C:\\K101", code);
  registerInstaller(kServerCodeNext, "C:\\K101\\");
  registerInstaller("{6E1C2A45-9F3B-4D21-8A10-5B2C7D0E9A01}", "C:\\K101");
  registerInstaller("{6E1C2A49-9F3B-4D21-8A10-5B2C7D0E9A01}", "C:\\K101");
  std::string productKey = std::string(kCopies) + "KXL101\\KXL Server Haldor Prime Edition\\COMPONENTS";
  setString(productKey, "Engine", "");
  InstallCopy copy("KXL101", false, false);
  InstalledProdList *list = nullptr;
  ASSERT_EQ(0u, copy.GetInstalledProdList(&list));
  EXPECT_EQ(Names({"hpe HALDOR_PRIME_EDITION 1 4 PROD_HALDOR_PRIME Engine",
                   "tlv TALVEN_EDITION 5 3 PROD_TALVEN", "cli CLIENT 9 -1 PROD_CLIENT"}),
            products(*list));
  EXPECT_STREQ(kServerCodeNext, elements(*list)[0]->registeredCode);
  InstalledProdList *again = nullptr;
  ASSERT_EQ(0u, copy.GetInstalledProdList(&again));
  EXPECT_EQ(list, again);
  EXPECT_EQ(KXLI_RC_NULL_ARGUMENT, copy.GetInstalledProdList(nullptr));
  // A copy installed for one user keeps its products' components there.
  setValue(HKEY_LOCAL_MACHINE, std::string(kCopies) + "KXL101\\Users");
  setValue(HKEY_CURRENT_USER, productKey, "Own Engine", "");
  InstallCopy perUser("KXL101", false, false);
  ASSERT_EQ(0u, perUser.GetInstalledProdList(&list));
  EXPECT_EQ(Names({"hpe HALDOR_PRIME_EDITION 1 4 PROD_HALDOR_PRIME Own Engine",
                   "tlv TALVEN_EDITION 5 3 PROD_TALVEN", "cli CLIENT 9 -1 PROD_CLIENT"}),
            products(*list));
}

TEST_F(Products, OfTheVersion8InstallationListOneVariantPerProduct) {
  registerV8("C:\\SQLLIB");
  for (const char *code : {"txt", "tud", "tpd", "srv", "kse", "rtc"})
    marker("C:\\SQLLIB", code);
  InstallCopy copy(KXLI_V8_COPY_NAME, false, false);
  InstalledProdList *list = nullptr;
  ASSERT_EQ(0u, copy.GetInstalledProdList(&list));
  EXPECT_EQ(Names({"srv KESSEL_SERVER 0 0 PROD_KESSEL", "tpd TAMBRO_DEVELOPER 0 0 PROD_TAMBRO",
                   "rtc RUNTIME_CLIENT 0 0 PROD_RUNTIME"}),
            products(*list));
  EXPECT_STREQ("KXL Server Edition.msi", elements(*list)[0]->GetInfo()->packageFile);
}

TEST_F(Products, WithAnUnknownCodeAreUnusable) {
  registerCopy("KXL101", "C:\\K101");
  InstallCopy copy("KXL101", false, false);
  InstalledProd unknown("zzz", &copy, nullptr);
  EXPECT_EQ(1u, unknown.GetStatus());
  char edition[64] = {};
  EXPECT_EQ(KXLI_RC_NOT_USABLE, unknown.GetEditionName(edition, sizeof edition));
  EXPECT_EQ(KXLI_RC_NULL_ARGUMENT, unknown.GetEditionName(nullptr, sizeof edition));
  EXPECT_EQ(0, unknown.GetSupportedNodeType());
  EXPECT_EQ(0u, unknown.GetRankNumber());
  InstalledProd none(nullptr, &copy, "{X}");
  EXPECT_EQ(1u, none.GetStatus());
  EXPECT_STREQ("{X}", none.registeredCode);

  InstalledProd known("HDE", &copy, nullptr);
  EXPECT_EQ(0u, known.GetStatus());
  EXPECT_EQ(KXLI_RC_BUFFER_TOO_SMALL, known.GetEditionName(edition, 14));
  EXPECT_EQ(0u, known.GetEditionName(edition, 15));
  EXPECT_STREQ("HALDOR_EDITION", edition);
  EXPECT_STREQ("", known.registeredCode);
}

} // namespace
