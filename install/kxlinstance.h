// Instances of one installed copy, from the platform's instance registry, each
// with its cluster membership and a snapshot of its database manager
// configuration file kxlsystm. An instance knows its copy by name only, so
// that copies (which hold their instances) stand above instances.
#pragma once

#include "install/ilist.h"
#include "platform/dbmcfgfile.h"

#include <cstdint>

inline constexpr uint32_t KXLI_INSTANCE_NAME_SZ = 9; // 8 characters
inline constexpr uint32_t KXLI_INSTANCE_DIR_SZ = 256;
inline constexpr uint32_t KXLI_CLUSTER_NAME_SZ = 256;

// Node types of an instance (1 to 5), as its kxlsystm gives them.
inline constexpr uint32_t KXL_NODE_TYPE_STANDALONE = 1;
inline constexpr uint32_t KXL_NODE_TYPE_CLIENT = 2; // no server of its own
inline constexpr uint32_t KXL_NODE_TYPE_SERVER = 3;
inline constexpr uint32_t KXL_NODE_TYPE_PARTITIONED = 4;

class IKXLINSTANCE {
public:
  // An empty holder: ReloadDbmCfg with a directory, then GetNodeType.
  IKXLINSTANCE();
  // name cut to 8 characters, instanceDir to 255; copyName names the copy
  // that owns the instance (null or "": none). Reads the kxlsystm snapshot
  // (a missing file leaves it zero) and, with an owner, "KXLCLUSTER" of the
  // instance's profile key.
  IKXLINSTANCE(const char *name, const char *copyName, const char *instanceDir);
  virtual ~IKXLINSTANCE();
  IKXLINSTANCE(const IKXLINSTANCE &) = delete;
  IKXLINSTANCE &operator=(const IKXLINSTANCE &) = delete;

  // String getters: 0, KXLI_RC_NULL_ARGUMENT for a null buffer,
  // KXLI_RC_BUFFER_TOO_SMALL when size < length + 1.
  uint32_t GetName(char *buffer, uint32_t size) const;
  uint32_t GetInstanceDir(char *buffer, uint32_t size) const;
  uint32_t GetClusterName(char *buffer, uint32_t size) const;
  // instanceDir without its last component "\" + name.
  uint32_t GetInstanceParentDir(char *buffer, uint32_t size) const;
  // The owner's name; KXLI_RC_NOT_USABLE without an owner.
  uint32_t GetCopyName(char *buffer, uint32_t size) const;

  // The node type word of the snapshot (1 to 5 for a real instance).
  uint16_t GetNodeType() const;
  // Replaces the snapshot from dir\kxlsystm (instanceDir when dir is null).
  // KXLI_RC_NULL_ARGUMENT when the file cannot be opened; the snapshot then
  // stays as it was.
  uint32_t ReloadDbmCfg(const char *dir);

  char copyName[KXLI_COPY_NAME_SZ]; // the owning copy, "" for none
  char instanceDir[KXLI_INSTANCE_DIR_SZ];
  char name[KXLI_INSTANCE_NAME_SZ];
  char clusterName[KXLI_CLUSTER_NAME_SZ];
  uint8_t isClustered;
  // The profile's cluster value could not be read (other than missing): the
  // instance may be clustered and must not be taken for one that is not.
  uint8_t clusterUnreadable;
  unsigned char dbmCfgImage[DBMCFG_IMAGE_SZ];

private:
  void readClusterName();
};

class IKXLINSTANCELIST : public ILIST<IKXLINSTANCE> {
public:
  // The instances whose owning copy is named `copyName` (for the version-8
  // copy: the instances registered without a copy name). status 0 built, 1
  // failed (also for a null or empty name).
  explicit IKXLINSTANCELIST(const char *copyName);
  virtual ~IKXLINSTANCELIST();

  // The lists of `count` copies from one walk of the platform's instances
  // (a walk per copy would read every instance once for each copy). 0 with
  // lists[i] the new list of the copy named copyNames[i]; otherwise every
  // lists[i] is null.
  static uint32_t BuildForCopies(const char *const *copyNames, uint32_t count, IKXLINSTANCELIST **lists);

  // As InstallCopyList::Find, by instance name.
  uint32_t Find(const char *name, IKXLINSTANCE **out);

  char copyName[KXLI_COPY_NAME_SZ];
  uint32_t status;

private:
  IKXLINSTANCELIST(const char *copyName, uint32_t initialStatus);
};
