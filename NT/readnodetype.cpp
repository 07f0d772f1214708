#include "NT/readnodetype.h"

#include "install/kxlinstance.h"
#include "platform/kxlsys.h"

#include <cstdio>
#include <cstring>
#include <memory>
#include <new>

namespace {

constexpr uint32_t kOpenFlags = 1092; // read only, binary, sequential
constexpr uint32_t kOpenMode = 1872;

// "<dir>\kxlsystm", or "\"<dir>\kxlsystm\"" for a directory in quotes.
bool configFilePath(const IKXLINSTANCE &instance, char *path, size_t size) {
  char dir[SQLO_PATH_SZ] = {};
  if (instance.GetInstanceDir(dir, sizeof dir) != 0)
    return false;
  size_t length = std::strlen(dir);
  bool quoted = dir[0] == '"';
  if (length > 0 && dir[length - 1] == '"')
    dir[length - 1] = '\0';
  int written = std::snprintf(path, size, "%s\\kxlsystm%s", dir, quoted ? "\"" : "");
  return written > 0 && static_cast<size_t>(written) < size;
}

// Fills image with up to its size in bytes of the open file; the count read.
int32_t readImage(SQLO_FHANDLE file, unsigned char *image, uint32_t &filled) {
  filled = 0;
  while (filled < DBMCFG_IMAGE_SZ) {
    uint32_t got = 0;
    int32_t rc = sqloread(file, image + filled, DBMCFG_IMAGE_SZ - filled, &got);
    if (rc != 0)
      return rc;
    if (got == 0)
      break;
    filled += got;
  }
  return 0;
}

} // namespace

bool nodeTypeFilePath(const IKXLINSTANCE *instance, char *path, size_t size) {
  if (path == nullptr || size == 0)
    return false;
  path[0] = '\0';
  if (instance != nullptr && configFilePath(*instance, path, size))
    return true;
  path[0] = '\0';
  return false;
}

int32_t readNodeType(const IKXLINSTANCE *instance, uint32_t *nodeType) {
  pdtEntry(KXL_FN_READ_NODE_TYPE);
  char path[SQLO_PATH_SZ + 16];
  if (instance == nullptr || nodeType == nullptr || !configFilePath(*instance, path, sizeof path)) {
    pdtExit(KXL_FN_READ_NODE_TYPE, SQLO_RC_INVALID_ARGUMENT, 5);
    return SQLO_RC_INVALID_ARGUMENT;
  }
  SQLO_FHANDLE file = nullptr;
  int32_t rc = sqloopenp(path, kOpenFlags, kOpenMode, &file, 0);
  if (rc != 0) {
    pdtError(KXL_FN_READ_NODE_TYPE, 10, rc);
    pdtExit(KXL_FN_READ_NODE_TYPE, rc, 10);
    return rc;
  }
  std::unique_ptr<unsigned char[]> image(new (std::nothrow) unsigned char[DBMCFG_IMAGE_SZ]());
  uint32_t filled = 0;
  rc = image ? readImage(file, image.get(), filled) : SQLO_RC_NO_MEMORY;
  sqloclose(file);
  // A file that ends before the word has no node type to give.
  if (rc == 0 && filled < DBMCFG_NODE_TYPE_OFFSET + 2)
    rc = SQLO_RC_INVALID_ARGUMENT;
  if (rc != 0) {
    pdtError(KXL_FN_READ_NODE_TYPE, 20, rc);
    pdtExit(KXL_FN_READ_NODE_TYPE, rc, 20);
    return rc;
  }
  *nodeType = sqloLe16(image.get(), DBMCFG_NODE_TYPE_OFFSET);
  pdtExit(KXL_FN_READ_NODE_TYPE, 0, 0);
  return 0;
}
