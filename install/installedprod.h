// Products of the product table installed in one copy: a product counts when
// the copy's folder holds its level marker "cfg\kxl<code>.lvl" and, for
// current-release copies, Windows Installer knows it as installed in exactly
// that folder.
#pragma once

#include "install/ilist.h"

#include <cstdint>

class InstallCopy;

inline constexpr uint32_t KXLI_PRODUCT_CODE_SZ = 39; // braced GUID, 38 characters

// Product categories.
inline constexpr uint32_t KXLI_CATEGORY_SERVER = 0;
inline constexpr uint32_t KXLI_CATEGORY_CLIENT = 1;
inline constexpr uint32_t KXLI_CATEGORY_ADDON = 2;
inline constexpr uint32_t KXLI_CATEGORY_CONNECT = 3;
inline constexpr uint32_t KXLI_CATEGORY_DOC = 4;

// Results of detectProduct.
inline constexpr uint32_t KXLI_DETECT_NONE = 0;
inline constexpr uint32_t KXLI_DETECT_MAIN = 1;    // the product code column matched
inline constexpr uint32_t KXLI_DETECT_SECOND = 16; // the second package's column
inline constexpr uint32_t KXLI_DETECT_THIRD = 256; // the third package's column
inline constexpr uint32_t KXLI_DETECT_V8 = 65535;  // version-8 installation

// The record an installed product copies from its table row.
struct KxlProductInfo {
  char key[64];
  char code[64];
  char productCode[255];
  char displayName[255];
  uint32_t productBit;
  char editionName[255];
  uint32_t category;
  int32_t supportedNodeType; // -1: hosts no instance
  uint8_t flag;
  uint32_t rankNumber;
  uint32_t productMask;
  char packageFile[255];
};

class InstalledProd {
public:
  // Looks `code` up (ignoring case) in the table that fits the copy; status 1
  // when the code is null or unknown. registeredCode null: empty.
  InstalledProd(const char *code, InstallCopy *copy, const char *registeredCode);
  virtual ~InstalledProd();
  InstalledProd(const InstalledProd &) = delete;
  InstalledProd &operator=(const InstalledProd &) = delete;

  // 0, KXLI_RC_NULL_ARGUMENT, KXLI_RC_NOT_USABLE without info, KXLI_RC_BUFFER_TOO_SMALL.
  uint32_t GetEditionName(char *buffer, uint32_t size) const;
  int32_t GetSupportedNodeType() const; // 0 without info
  uint32_t GetRankNumber() const;       // 0 without info
  uint32_t GetStatus() const { return status; }
  const KxlProductInfo *GetInfo() const { return info; }
  ILIST<char> &GetComponents() { return components; }

  KxlProductInfo *info; // owned; null when the code matched no row
  InstallCopy *copy;    // not owned
  char registeredCode[KXLI_PRODUCT_CODE_SZ];
  uint32_t status; // 0 valid, 1 unknown code
  ILIST<char> components;

private:
  void readComponentNames();
};

class InstalledProdList : public ILIST<InstalledProd> {
public:
  explicit InstalledProdList(InstallCopy *copy);
  virtual ~InstalledProdList();

  InstallCopy *copy; // not owned
  uint32_t status;   // always 0

private:
  void addProduct(const char *code, const char *registered);
  void addCurrentReleaseProducts();
  void addV8Products();
};

// Whether the product `code` is installed in installPath. registeredCodeOut
// (KXLI_PRODUCT_CODE_SZ bytes) receives the product code it was found under.
// Results: KXLI_DETECT_*.
uint32_t detectProduct(const char *code, const char *installPath, char *registeredCodeOut, bool v8Mode,
                       bool view32);
