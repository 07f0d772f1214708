#include "install/installedprod.h"

#include "install/installcopy.h"
#include "install/iutil.h"
#include "install/producttable.h"
#include "platform/win32.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <new>

namespace {

constexpr uint32_t kMarkerFixedChars = 11; // "cfg\kxl" and ".lvl"
constexpr size_t kMarkerLimit = 256;
constexpr uint32_t kDerivedCodes = 15;
constexpr DWORD kLocationSz = 256;

bool endsWithBackslash(const char *text) {
  size_t length = std::strlen(text);
  return length > 0 && text[length - 1] == '\\';
}

// installPath\cfg\kxl<code>.lvl; false when it would be too long.
bool markerPath(const char *installPath, const char *code, char *path, size_t size) {
  if (std::strlen(installPath) + std::strlen(code) + kMarkerFixedChars >= kMarkerLimit)
    return false;
  const char *separator = endsWithBackslash(installPath) ? "" : "\\";
  return std::snprintf(path, size, "%s%scfg\\kxl%s.lvl", installPath, separator, code) <
         static_cast<int>(size);
}

// Two installation paths name the same folder when they agree ignoring case,
// one trailing backslash on either side aside.
bool samePath(const char *a, const char *b) {
  size_t lengthA = std::strlen(a) - (endsWithBackslash(a) ? 1 : 0);
  size_t lengthB = std::strlen(b) - (endsWithBackslash(b) ? 1 : 0);
  return lengthA == lengthB && kxliSameText(a, b, lengthA);
}

// Windows Installer knows `productCode` as installed in installPath.
bool installedAt(const char *productCode, const char *installPath) {
  if (MsiQueryProductStateA(productCode) != INSTALLSTATE_DEFAULT)
    return false;
  char location[kLocationSz] = {};
  DWORD size = sizeof location;
  if (MsiGetProductInfoA(productCode, INSTALLPROPERTY_INSTALLLOCATION, location, &size) != ERROR_SUCCESS)
    return false;
  location[sizeof location - 1] = '\0';
  return samePath(location, installPath);
}

// The column's code or one of its derived codes installed in installPath,
// copied into registeredCodeOut.
bool matchColumn(const char *columnCode, const char *installPath, char *registeredCodeOut) {
  if (columnCode == nullptr || columnCode[0] == '\0')
    return false;
  char candidate[KXLI_PRODUCT_CODE_SZ + 8];
  kxliSetString(candidate, sizeof candidate, columnCode);
  for (uint32_t k = 0; k <= kDerivedCodes; ++k) {
    if (k > 0 && !kxliDerivedCode(columnCode, k, candidate, sizeof candidate))
      return false;
    if (installedAt(candidate, installPath)) {
      if (registeredCodeOut != nullptr)
        kxliSetString(registeredCodeOut, KXLI_PRODUCT_CODE_SZ, candidate);
      return true;
    }
  }
  return false;
}

uint32_t detectV8(const char *code, char *registeredCodeOut) {
  if (kxliSameName(code, "txt"))
    return KXLI_DETECT_NONE;
  const KxliProductRow *row = kxliFindProductRow(code, true);
  if (registeredCodeOut != nullptr)
    kxliSetString(registeredCodeOut, KXLI_PRODUCT_CODE_SZ, row != nullptr ? row->productCode : "");
  return KXLI_DETECT_V8;
}

uint32_t detectCurrent(const char *code, const char *installPath, char *registeredCodeOut, bool view32) {
  const KxliProductRow *row = kxliFindProductRow(code, false);
  if (row == nullptr)
    return KXLI_DETECT_NONE;
  const struct {
    const char *code;
    uint32_t result;
  } columns[] = {
      {view32 ? row->productCode32 : row->productCode, KXLI_DETECT_MAIN},
      {view32 ? row->secondCode32 : row->secondCode, KXLI_DETECT_SECOND},
      {view32 ? row->thirdCode32 : row->thirdCode, KXLI_DETECT_THIRD},
  };
  for (const auto &column : columns) {
    if (matchColumn(column.code, installPath, registeredCodeOut))
      return column.result;
  }
  return KXLI_DETECT_NONE;
}

void fillInfo(KxlProductInfo &info, const KxliProductRow &row) {
  kxliSetString(info.key, sizeof info.key, row.key);
  kxliSetString(info.code, sizeof info.code, row.code);
  kxliSetString(info.productCode, sizeof info.productCode, row.productCode);
  kxliSetString(info.displayName, sizeof info.displayName, row.displayName);
  info.productBit = row.productBit;
  kxliSetString(info.editionName, sizeof info.editionName, row.editionName);
  info.category = row.category;
  info.supportedNodeType = row.supportedNodeType;
  info.flag = row.flag;
  info.rankNumber = row.rankNumber;
  info.productMask = row.productMask;
  if (row.packageFile != nullptr)
    kxliSetString(info.packageFile, sizeof info.packageFile, row.packageFile);
  else
    std::snprintf(info.packageFile, sizeof info.packageFile, "%s%s", row.displayName, ".msi");
}

} // namespace

uint32_t detectProduct(const char *code, const char *installPath, char *registeredCodeOut, bool v8Mode,
                       bool view32) {
  if (code == nullptr || installPath == nullptr)
    return KXLI_DETECT_NONE;
  char marker[kMarkerLimit + 8];
  if (!markerPath(installPath, code, marker, sizeof marker) || _access(marker, 0) != 0)
    return KXLI_DETECT_NONE;
  if (v8Mode)
    return detectV8(code, registeredCodeOut);
  return detectCurrent(code, installPath, registeredCodeOut, view32);
}

// ---------------------------------------------------------------------------
// InstalledProd
// ---------------------------------------------------------------------------

InstalledProd::InstalledProd(const char *code, InstallCopy *owner, const char *registered)
    : info(nullptr), copy(owner), registeredCode{}, status(0) {
  kxliSetString(registeredCode, sizeof registeredCode, registered);
  bool v8 = copy != nullptr && copy->IsV8Copy();
  const KxliProductRow *row = kxliFindProductRow(code, v8);
  if (row != nullptr)
    info = new (std::nothrow) KxlProductInfo{};
  if (info == nullptr) {
    status = 1;
    return;
  }
  fillInfo(*info, *row);
  readComponentNames();
}

InstalledProd::~InstalledProd() {
  delete info;
}

void InstalledProd::readComponentNames() {
  if (copy == nullptr)
    return;
  char registryKey[KXLI_COPY_PATH_SZ] = {};
  copy->GetRegistryKey(registryKey, sizeof registryKey);
  char key[KXLI_PATH_BUFFER_SZ + 256];
  std::snprintf(key, sizeof key, "%s\\%s\\COMPONENTS", registryKey, info->displayName);
  if (copy->IsPerUserCopy())
    kxliReadValueNames(HKEY_CURRENT_USER, key, KEY_QUERY_VALUE, components);
  else
    kxliReadValueNames(HKEY_LOCAL_MACHINE, key, copy->GetRegistryView() | KEY_QUERY_VALUE, components);
}

uint32_t InstalledProd::GetEditionName(char *buffer, uint32_t size) const {
  if (buffer == nullptr)
    return KXLI_RC_NULL_ARGUMENT;
  if (info == nullptr)
    return KXLI_RC_NOT_USABLE;
  return kxliGetString(info->editionName, buffer, size);
}

int32_t InstalledProd::GetSupportedNodeType() const {
  return info != nullptr ? info->supportedNodeType : 0;
}

uint32_t InstalledProd::GetRankNumber() const {
  return info != nullptr ? info->rankNumber : 0;
}

// ---------------------------------------------------------------------------
// InstalledProdList
// ---------------------------------------------------------------------------

InstalledProdList::InstalledProdList(InstallCopy *owner) : copy(owner), status(0) {
  if (copy == nullptr)
    return;
  if (copy->IsV8Copy())
    addV8Products();
  else
    addCurrentReleaseProducts();
}

InstalledProdList::~InstalledProdList() = default;

void InstalledProdList::addProduct(const char *code, const char *registered) {
  InstalledProd *product = new (std::nothrow) InstalledProd(code, copy, registered);
  if (product == nullptr)
    return;
  if (product->status != 0) {
    delete product;
    return;
  }
  Append(product);
}

void InstalledProdList::addCurrentReleaseProducts() {
  char path[KXLI_COPY_PATH_SZ] = {};
  copy->GetPath(path, sizeof path);
  KxliProductTable table = kxliProductTable(false);
  for (size_t i = 0; i < table.count; ++i) {
    char registered[KXLI_PRODUCT_CODE_SZ] = {};
    if (detectProduct(table.rows[i].code, path, registered, false, copy->GetRegistryView() != 0) !=
        KXLI_DETECT_NONE)
      addProduct(table.rows[i].code, registered);
  }
}

// Of the rows sharing the server key or the developer key only the first one
// detected counts: they are variants of one product.
void InstalledProdList::addV8Products() {
  char path[KXLI_COPY_PATH_SZ] = {};
  copy->GetPath(path, sizeof path);
  bool haveKessel = false;
  bool haveTambro = false;
  KxliProductTable table = kxliProductTable(true);
  for (size_t i = 0; i < table.count; ++i) {
    const KxliProductRow &row = table.rows[i];
    char registered[KXLI_PRODUCT_CODE_SZ] = {};
    if (detectProduct(row.code, path, registered, true, false) != KXLI_DETECT_V8)
      continue;
    bool *seen = kxliSameName(row.key, "PROD_KESSEL")   ? &haveKessel
                 : kxliSameName(row.key, "PROD_TAMBRO") ? &haveTambro
                                                        : nullptr;
    if (seen != nullptr && *seen)
      continue;
    if (seen != nullptr)
      *seen = true;
    addProduct(row.code, registered);
  }
}
