// What the server rules of the configuration conversion take from the platform:
// the flag area index of two parameters and the partition divisor.
#include "NT/dbmcfg_internal.h"

#include <cstdlib>
#include <cstring>

namespace kxldbm {

namespace {

constexpr uint32_t kTokenA = 803;
constexpr uint32_t kTokenB = 79;
constexpr uint32_t kExtraAgentsVariable = 253;
constexpr int64_t kSharedHostPartitions = 2; // added when the control block's flag is set

// The index of a parameter inside the flag area, or -1 (also for a parameter
// the platform does not know); a lookup that fails otherwise goes to `failure`.
int32_t flagIndex(uint32_t token, int32_t &failure) {
  SQLF_PARAM_INFO info{};
  int32_t index = -1;
  int32_t rc = sqlf_get_param_info(token, 0, &info, &index);
  if (rc != 0) {
    if (rc != SQLO_RC_NOT_FOUND && failure == 0)
      failure = rc;
    return -1;
  }
  return index >= 0 && index < static_cast<int32_t>(kFlagAreaSize) ? index : -1;
}

// Bounds of the partition table, taken from its own header.
struct TableView {
  const unsigned char *bytes;
  uint32_t size;
};

// The host name of the entry at `offset`, or null when the entry does not lie
// whole inside the table or its name is not terminated inside the entry.
const char *entryHost(const TableView &table, uint32_t offset) {
  if (offset < SQLO_NODELIST_HDR_INDEX || offset > table.size || table.size - offset <= SQLO_NODE_NAMES)
    return nullptr;
  uint32_t length = get16(table.bytes, offset + SQLO_NODE_LENGTH);
  if (length <= SQLO_NODE_NAMES || length > table.size - offset)
    return nullptr;
  const char *host = reinterpret_cast<const char *>(table.bytes + offset + SQLO_NODE_NAMES);
  return std::memchr(host, '\0', length - SQLO_NODE_NAMES) != nullptr ? host : nullptr;
}

// Offset of the current partition's entry, or 0 when it has none.
uint32_t currentEntry(const TableView &table, int16_t partition) {
  if (partition < 0 || partition > SQLO_MAX_NODE_NUMBER)
    return 0;
  uint32_t slots = get32(table.bytes, 12);
  uint32_t slot = SQLO_NODELIST_HDR_INDEX + 4u * static_cast<uint32_t>(partition);
  if (static_cast<uint32_t>(partition) >= slots || slot > table.size || table.size - slot < 4)
    return 0;
  return get32(table.bytes, slot);
}

// Number of entries whose host name equals `host` (exact comparison).
int64_t partitionsOnHost(const TableView &table, const char *host) {
  int32_t count = static_cast<int32_t>(get32(table.bytes, SQLO_NODELIST_HDR_COUNT));
  uint32_t offset = get32(table.bytes, SQLO_NODELIST_HDR_FIRST);
  int64_t same = 0;
  for (int32_t entry = 0; entry < count; ++entry) {
    const char *name = entryHost(table, offset);
    if (name == nullptr)
      break;
    if (std::strcmp(name, host) == 0)
      ++same;
    offset += get16(table.bytes, offset + SQLO_NODE_LENGTH);
  }
  return same;
}

// Partitions that share this host, plus the platform's extra agents setting
// (or 2 when the control block says partitions share hosts).
uint32_t partitionDivisor() {
  const sqlz_krcb *block = sqlz_krcbp;
  if (block == nullptr || block->partitionTable == nullptr)
    return 0;
  const unsigned char *bytes = reinterpret_cast<const unsigned char *>(block->partitionTable);
  TableView table{bytes, get32(bytes, 8)};
  if (table.size < SQLO_NODELIST_HDR_INDEX)
    return 0;
  const char *host = entryHost(table, currentEntry(table, block->currentPartition));
  if (host == nullptr)
    return 0;
  int64_t divisor = partitionsOnHost(table, host);
  char *extra = nullptr;
  if (sqloGetEnvInternal(kExtraAgentsVariable, &extra) == 0 && extra != nullptr)
    divisor += std::atoi(extra);
  else if (block->partitionFlag != 0)
    divisor += kSharedHostPartitions;
  return divisor > 0 && divisor <= INT32_MAX ? static_cast<uint32_t>(divisor) : 0;
}

} // namespace

ServerInputs readServerInputs(uint16_t sourceRelease) {
  ServerInputs inputs;
  if (sourceRelease < kRelease12) {
    inputs.flagIndex803 = flagIndex(kTokenA, inputs.platformFailure);
    inputs.flagIndex79 = flagIndex(kTokenB, inputs.platformFailure);
  }
  if (sourceRelease < kRelease11)
    inputs.partitionDivisor = partitionDivisor();
  return inputs;
}

} // namespace kxldbm
