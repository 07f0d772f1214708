// Fuzz target of the configuration file conversion: arbitrary bytes as the
// saved source file. The validators see the bytes as they are; then the bytes
// are sealed with a valid checksum so that every converter is reached, against
// a target of each node type, and the result must come out sealed.
#include "NT/dbmcfg_internal.h"

#include <cstdlib>
#include <cstring>
#include <fstream>
#include <iterator>
#include <vector>

namespace {

using namespace kxldbm;

// What the file layer would do with these bytes as a first read.
void validate(const uint8_t *data, size_t size) {
  static Image image;
  if (size != kImageSize && size != kSmallSize)
    return;
  if (checkRelease(data) != 0)
    return;
  if (size == kSmallSize)
    expandSmall(data, image);
  else
    verifyImage(data);
}

void convertAgainstEveryTarget(const Image &source, const ServerInputs &inputs) {
  for (uint16_t type = 0; type <= 6; ++type) {
    static Image target;
    std::memset(target, 0, kImageSize);
    put16(target, kReleaseOffset, kRelease13);
    put16(target, DBMCFG_NODE_TYPE_OFFSET, type);
    sealImage(target);
    if (convertImages(target, source, inputs) == 0 && verifyImage(target) != 0)
      std::abort(); // a converted image must carry its checksum
  }
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  validate(data, size);
  if (size < DBMCFG_NODE_TYPE_OFFSET + 2)
    return 0;
  static Image source;
  std::memset(source, 0, kImageSize);
  std::memcpy(source, data, size < kImageSize ? size : kImageSize);
  if (checkRelease(source) != 0)
    return 0;
  sealImage(source);
  ServerInputs inputs;
  inputs.flagIndex803 = int8_t(data[0]) * 5;
  inputs.flagIndex79 = int8_t(data[1]) * 5;
  inputs.partitionDivisor = data[2] & 7;
  convertAgainstEveryTarget(source, inputs);
  return 0;
}

#ifdef KXL_FUZZ_REPLAY_MAIN
// Without libFuzzer: replays the files named on the command line.
int main(int argc, char **argv) {
  for (int i = 1; i < argc; ++i) {
    std::ifstream in(argv[i], std::ios::binary);
    std::vector<uint8_t> bytes((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
    LLVMFuzzerTestOneInput(bytes.data(), bytes.size());
  }
  return 0;
}
#endif
