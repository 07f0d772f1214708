// How fast a world is written and compared.
//
// Baseline: formatting and parsing a hive of the same size in memory. The
// registry benchmarks write the same values through the Win32 surface, once
// written through on every change and once inside a write batch; building the
// demo world and comparing two copies of it are what every scenario test pays.
#include "platform/win32.h"
#include "sim/kxlsim/diff.h"
#include "sim/kxlsim/scenarios.h"
#include "sim/posix/regfile.h"
#include "sim/posix/world.h"

#include <benchmark/benchmark.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>

namespace fs = std::filesystem;
namespace hive = kxlsim::posix::hive;

namespace {

// A fresh, empty world for one benchmark; removed afterwards.
class TempWorld {
public:
  TempWorld() {
    std::string pattern = (fs::temp_directory_path() / "kxlbench.XXXXXX").string();
    if (mkdtemp(pattern.data()) == nullptr)
      std::abort();
    root_ = pattern;
    std::ofstream(root_ / "system.reg") << "REGEDIT4\n\n";
    std::ofstream(root_ / "user.reg") << "REGEDIT4\n\n";
    fs::create_directories(root_ / "drive_c");
    select(root_);
  }
  ~TempWorld() {
    std::error_code ignored;
    fs::remove_all(root_, ignored);
  }
  static void select(const fs::path &root) {
    setenv("KXLSIM_ROOT", root.c_str(), 1);
    kxlsim::posix::resetWorldRoot();
  }
  const fs::path &root() const { return root_; }

private:
  fs::path root_;
};

// The demo world as the scenario tests build it: the build's programs and catalogs.
kxlsim::InstallSources demoSources() {
  return {KXL_TOOLS, KXL_COMMAND, KXL_MESSAGES};
}

std::string valueName(int64_t i) {
  return "Value" + std::to_string(i);
}

void writeValues(int64_t count) {
  HKEY key = nullptr;
  RegCreateKeyExA(HKEY_LOCAL_MACHINE, "SOFTWARE\\Bench", 0, nullptr, 0, KEY_ALL_ACCESS, nullptr, &key,
                  nullptr);
  for (int64_t i = 0; i < count; ++i) {
    std::string data = "data of " + valueName(i);
    RegSetValueExA(key, valueName(i).c_str(), 0, REG_SZ, reinterpret_cast<const BYTE *>(data.c_str()),
                   static_cast<DWORD>(data.size() + 1));
  }
  RegCloseKey(key);
}

void BM_HiveFormatAndParseBaseline(benchmark::State &state) {
  hive::Key root;
  bool created = false;
  hive::Key &key = hive::createKey(root, {"SOFTWARE", "Bench"}, created);
  for (int64_t i = 0; i < state.range(0); ++i) {
    std::string data = "data of " + valueName(i);
    hive::setValue(key, valueName(i), REG_SZ, std::vector<BYTE>(data.begin(), data.end()));
  }
  for (auto _ : state) {
    hive::Key parsed;
    std::string error;
    bool ok =
        hive::parseHive(hive::formatHive(root, "HKEY_LOCAL_MACHINE"), "HKEY_LOCAL_MACHINE", parsed, error);
    benchmark::DoNotOptimize(ok);
  }
}
BENCHMARK(BM_HiveFormatAndParseBaseline)->Arg(200)->Unit(benchmark::kMillisecond);

void BM_RegistryWrittenThroughPerValue(benchmark::State &state) {
  for (auto _ : state) {
    TempWorld world;
    writeValues(state.range(0));
  }
}
BENCHMARK(BM_RegistryWrittenThroughPerValue)->Arg(200)->Unit(benchmark::kMillisecond);

void BM_RegistryWrittenInOneBatch(benchmark::State &state) {
  for (auto _ : state) {
    TempWorld world;
    hive::WriteBatch batch;
    writeValues(state.range(0));
    batch.commit();
  }
}
BENCHMARK(BM_RegistryWrittenInOneBatch)->Arg(200)->Unit(benchmark::kMillisecond);

void BM_CreateDemoWorld(benchmark::State &state) {
  for (auto _ : state) {
    TempWorld scratch;
    std::vector<std::string> errors;
    kxlsim::createWorld((scratch.root() / "world").string(), "demo", demoSources(), errors);
  }
}
BENCHMARK(BM_CreateDemoWorld)->Unit(benchmark::kMillisecond);

void BM_DiffOfTwoEqualDemoWorlds(benchmark::State &state) {
  TempWorld scratch;
  std::vector<std::string> errors;
  fs::path a = scratch.root() / "a", b = scratch.root() / "b";
  kxlsim::createWorld(a.string(), "demo", demoSources(), errors);
  fs::copy(a, b, fs::copy_options::recursive);
  for (auto _ : state) {
    std::ostringstream out;
    benchmark::DoNotOptimize(kxlsim::diffWorlds(a.string(), b.string(), out));
  }
}
BENCHMARK(BM_DiffOfTwoEqualDemoWorlds)->Unit(benchmark::kMillisecond);

} // namespace

BENCHMARK_MAIN();
