// Installed copies of the product, as registered under
// SOFTWARE\ZAV\KXL\InstalledCopies (and the version-8 installation directly
// under SOFTWARE\ZAV\KXL). Built once from the registry; a caller that needs
// the registry's current state builds a new list.
#pragma once

#include "install/ilist.h"

#include <cstdint>

class IKXLINSTANCELIST;
class InstalledProdList;
class InstallCopyList;

inline constexpr uint32_t KXLI_COPY_PATH_SZ = 256;

// Registry access flags of the 32-bit and 64-bit registry views.
inline constexpr uint32_t KXLI_VIEW32 = 0x200;
inline constexpr uint32_t KXLI_VIEW64 = 0x100;

// Version record of GetVersion: 80 bytes, allocated with new (zero-filled);
// the caller releases it with delete.
struct CopyVersion {
  int32_t version;
  int32_t release;
  int32_t modification;
  int32_t fixLevel; // 0 for the version-8 installation
  char serviceLevel[64];
};
static_assert(sizeof(CopyVersion) == 80);

class InstallCopy {
public:
  // Reads the copy's registration; the outcome is in status.
  InstallCopy(const char *name, bool view32, bool view64);
  virtual ~InstallCopy();
  InstallCopy(const InstallCopy &) = delete;
  InstallCopy &operator=(const InstallCopy &) = delete;

  // String getters: 0, KXLI_RC_NULL_ARGUMENT for a null buffer,
  // KXLI_RC_BUFFER_TOO_SMALL when size < length + 1.
  uint32_t GetName(char *buffer, uint32_t size) const;
  uint32_t GetPath(char *buffer, uint32_t size) const;
  uint32_t GetRegistryKey(char *buffer, uint32_t size) const;

  uint8_t IsV8Copy() const { return isV8; }
  uint8_t IsPerUserCopy() const { return perUser; }
  uint32_t GetRegistryView() const { return view32; }
  uint32_t GetStatus() const { return status; }
  // Value names under the copy's COMPONENTS key, in registry order.
  ILIST<char> &GetComponents() { return components; }

  // Hands a new version record to the caller at once (*out set even when a
  // read fails later); 0, a Windows registry error code, KXLI_RC_NULL_ARGUMENT
  // or KXLI_RC_NO_MEMORY.
  uint32_t GetVersion(CopyVersion **out);
  // The copy's instances, built on the first call and kept by the copy.
  // KXLI_RC_NOT_USABLE for a copy without a name or when the first build failed.
  uint32_t GetInstanceList(IKXLINSTANCELIST **out);
  // The copy's installed products, the same way.
  uint32_t GetInstalledProdList(InstalledProdList **out);

  char name[KXLI_COPY_NAME_SZ];
  char path[KXLI_COPY_PATH_SZ];        // "KXL Path Name", one trailing backslash removed
  char registryKey[KXLI_COPY_PATH_SZ]; // under HKEY_LOCAL_MACHINE
  uint8_t isV8;
  uint8_t perUser;                      // the copy's key has a "Users" subkey
  uint32_t view32;                      // KXLI_VIEW32 or 0
  uint32_t view64;                      // KXLI_VIEW64 or 0
  InstalledProdList *installedProducts; // owned, null until asked for
  IKXLINSTANCELIST *instances;          // owned, null until asked for
  uint32_t status;                      // 0 valid, 1 registration unreadable, 2 no "Components" (32-bit view)
  ILIST<char> components;
  InstallCopyList *family = nullptr; // the list holding this copy, if any; not owned

private:
  bool readRegistration();
  void readUsersKey();
  void readComponentsKey();
  void readComponentNames();
  template <class List, class Source> uint32_t subList(List *&kept, List **out, Source source);
};

inline constexpr uint32_t KXLI_COPY_OK = 0;
inline constexpr uint32_t KXLI_COPY_UNREADABLE = 1;
inline constexpr uint32_t KXLI_COPY_NO_COMPONENTS = 2;

class InstallCopyList : public ILIST<InstallCopy> {
public:
  // Builds the list: the version-8 installation first when registered, then
  // every readable copy under InstalledCopies. status 0 built, 1 failed.
  InstallCopyList(bool view32, bool view64);
  virtual ~InstallCopyList();

  // The first copy named `name` ignoring case: 0 and *out, or
  // KXLI_RC_NAME_NOT_FOUND (*out untouched); KXLI_RC_NULL_ARGUMENT for null out.
  uint32_t Find(const char *name, InstallCopy **out);

  // Gives every copy of the list without an instance list yet its list, from
  // one walk of the instances. A copy whose list cannot be built is left
  // without one.
  void BuildInstanceLists();

  InstallCopy *v8Copy; // also the list's first element; not owned separately
  uint32_t view32;
  uint32_t view64;
  uint32_t status;

private:
  bool addV8Copy();
  void addInstalledCopies();
  uint32_t adopt(InstallCopy *copy);
};
