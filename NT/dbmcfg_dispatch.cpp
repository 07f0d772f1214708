// upgradeDbmConfig: loads both files, picks the converter from the two node
// types, finishes the image and rewrites the target.
#include "NT/dbmcfg.h"
#include "NT/dbmcfg_fields.h"
#include "NT/dbmcfg_internal.h"
#include "upgrade/errortrace.h"

#include <cstring>
#include <memory>
#include <new>

namespace kxldbm {

namespace {

constexpr uint16_t kMaxNodeType = 5;

constexpr uint32_t kProbeSource = 10;
constexpr uint32_t kProbeTarget = 20;
constexpr uint32_t kProbeNodeTypes = 30;
constexpr uint32_t kProbeWrite = 40;
constexpr uint32_t kProbeMemory = 50;
constexpr uint32_t kProbePlatform = 60;

using enum Converter;

// Rows: target node type 1-5; columns: source node type 1-5.
constexpr Converter kDispatch[kMaxNodeType][kMaxNodeType] = {
    {Type1, General, Type3, None, Type5}, {General, General, General, None, General},
    {Type3, General, Type3, None, Type5}, {Type1, General, Type3, Merge, Type5},
    {Type5, General, Type5, None, Type5},
};

// Both images and the target's bytes as read, kept off the stack.
struct Work {
  LoadedFile source;
  LoadedFile target;
};

constexpr ErrorTrace traced{KXL_FN_UPGRADE_DBM_CONFIG};

int32_t fail(uint32_t probe, int32_t rc) {
  traced(probe, rc);
  pdtExit(KXL_FN_UPGRADE_DBM_CONFIG, rc, probe);
  return rc;
}

} // namespace

Converter selectConverter(uint16_t targetType, uint16_t sourceType) {
  if (targetType < 1 || targetType > kMaxNodeType || sourceType < 1 || sourceType > kMaxNodeType)
    return None;
  return kDispatch[targetType - 1][sourceType - 1];
}

bool needsServerInputs(Converter converter) {
  return converter != None && converter != General;
}

int32_t convertImages(unsigned char *target, const unsigned char *source, const ServerInputs &inputs) {
  Converter converter = selectConverter(nodeType(target), nodeType(source));
  if (converter == None)
    return KXL_DBMCFG_RC_NODE_TYPES;
  convertGeneral(target, source);
  if (needsServerInputs(converter))
    applyServerRules(target, source, converter, inputs);
  if (source[kJavaPath.offset] != 0 && releaseCode(source) == releaseCode(target))
    std::memcpy(target + kJavaPath.offset, source + kJavaPath.offset, kJavaPath.size);
  rangeCheck(target);
  sealImage(target);
  return 0;
}

} // namespace kxldbm

int32_t upgradeDbmConfig(const char *targetPath, const char *sourcePath) {
  using namespace kxldbm;
  pdtEntry(KXL_FN_UPGRADE_DBM_CONFIG);
  if (targetPath == nullptr || sourcePath == nullptr)
    return fail(kProbeSource, KXL_DBMCFG_RC_FILE);
  std::unique_ptr<Work> work(new (std::nothrow) Work);
  if (!work)
    return fail(kProbeMemory, KXL_DBMCFG_RC_FILE);
  if (int32_t rc = loadFile(sourcePath, FileRole::Source, work->source); rc != 0)
    return fail(kProbeSource, rc);
  if (int32_t rc = loadFile(targetPath, FileRole::Target, work->target); rc != 0)
    return fail(kProbeTarget, rc);
  Converter converter = selectConverter(nodeType(work->target.image), nodeType(work->source.image));
  ServerInputs inputs;
  if (needsServerInputs(converter))
    inputs = readServerInputs(releaseCode(work->source.image));
  if (inputs.platformFailure != 0)
    return fail(kProbePlatform, inputs.platformFailure);
  if (int32_t rc = convertImages(work->target.image, work->source.image, inputs); rc != 0)
    return fail(kProbeNodeTypes, rc);
  if (int32_t rc = writeTarget(targetPath, work->target); rc != 0)
    return fail(kProbeWrite, rc);
  pdtExit(KXL_FN_UPGRADE_DBM_CONFIG, 0, 0);
  return 0;
}
