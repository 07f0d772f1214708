// Whole upgrades on large machines, each timed beside a baseline in the same
// run: rounds alternate between the upgrade and its baseline, and every row
// reports the median of the per-round ratios, so a machine that drifts in
// speed during the run still gives comparable figures.
//
// Rows, each at full and half size so growth shows:
//   copies      many copies and instances: an unknown instance, and the
//               upgrade of one instance, against the demo upgrade;
//   partitions  a partitioned instance spread over many machines, against the
//               demo upgrade;
//   files       one folder of many small files, against `cp -a` of the
//               instance directory twice (the backup and the copy to the new
//               profile path are the two copies the run must make);
//   large       a few large files and many small ones, against the same;
//   failure     an upgrade that fails after its two copies and puts the
//               instance directory back from the backup, against the three
//               copies it makes: `cp -a` twice, then the backup copied back
//               over the directory (`cp -a backup/. dir`).
// The removals a run ends with (the backup, or after a failure its copies)
// are not in the baselines: they are the run's own cost beyond the copies.
//
// Usage: kxl_upgrade_bench [--rounds N] [--only ROW[,ROW...]] [--half-only]
//                          [--command PATH] [--tools PATH] [--messages DIR]
// The last three take the programs and catalogs of another build (to compare
// builds); by default those of this build. With KXL_BENCH_KEEP set the worlds
// stay in the scratch folder, named on standard error, to be looked into.
#include "sim/kxlsim/scenarios.h"
#include "sim/posix/regfile.h"

#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <functional>
#include <string>
#include <vector>

namespace fs = std::filesystem;
using kxlsim::WorldWriter;

namespace {

constexpr const char *kOldCopyPath = "C:\\Program Files\\ZAV\\KXL95";
constexpr const char *kCommand = "drive_c/Program Files/ZAV/KXL101/bin/kxliupgrade.exe";
constexpr const char *kInstanceDir = "drive_c/Program Files/ZAV/KXL95/INST1";

struct Options {
  kxlsim::InstallSources sources{KXL_TOOLS, KXL_COMMAND, KXL_MESSAGES};
  int rounds = 5;
  std::vector<std::string> only;
  bool halfOnly = false;
};

// ---------------------------------------------------------------- processes

// Runs a program to its end; its output goes to /dev/null. Returns the wall
// time in seconds, or a negative number when it could not be run or failed
// (an exit code other than `expected`).
double runTimed(const std::vector<std::string> &argv, const std::vector<std::string> &env, int expected) {
  auto start = std::chrono::steady_clock::now();
  pid_t pid = fork();
  if (pid < 0)
    return -1;
  if (pid == 0) {
    for (const std::string &entry : env)
      putenv(const_cast<char *>(entry.c_str()));
    std::vector<char *> args;
    for (const std::string &arg : argv)
      args.push_back(const_cast<char *>(arg.c_str()));
    args.push_back(nullptr);
    if (std::freopen("/dev/null", "w", stdout) == nullptr ||
        std::freopen("/dev/null", "w", stderr) == nullptr)
      _exit(126);
    execv(args[0], args.data());
    _exit(127);
  }
  int status = 0;
  while (waitpid(pid, &status, 0) < 0) {
  }
  double seconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
  if (!WIFEXITED(status) || WEXITSTATUS(status) != expected) {
    std::fprintf(stderr, "bench: %s ended with status %d\n", argv[0].c_str(),
                 WIFEXITED(status) ? WEXITSTATUS(status) : -1);
    return -1;
  }
  return seconds;
}

bool run(const std::vector<std::string> &argv) {
  return runTimed(argv, {}, 0) >= 0;
}

// ---------------------------------------------------------------- worlds

// A new demo world at `dir`, then `extend` adds to it in one registry batch.
bool buildWorld(const fs::path &dir, const kxlsim::InstallSources &sources,
                const std::function<void(WorldWriter &)> &extend) {
  std::vector<std::string> errors;
  if (!kxlsim::createWorld(dir.string(), "demo", sources, errors)) {
    for (const std::string &e : errors)
      std::fprintf(stderr, "bench: %s\n", e.c_str());
    return false;
  }
  WorldWriter w;
  {
    kxlsim::posix::hive::WriteBatch batch;
    extend(w);
    if (!batch.commit())
      w.note("registry not written");
  }
  for (const std::string &e : w.errors())
    std::fprintf(stderr, "bench: %s\n", e.c_str());
  return w.ok();
}

std::string numbered(const char *prefix, int n, int width = 4) {
  char text[64];
  std::snprintf(text, sizeof text, "%s%0*d", prefix, width, n);
  return text;
}

// `copies` copies in all (the demo's three among them), `instances` instances
// in all, the extra ones spread over the extra copies.
void addCopiesAndInstances(WorldWriter &w, int copies, int instances) {
  std::vector<kxlsim::CopySpec> extra;
  for (int c = 0; c + 3 < copies; ++c) {
    kxlsim::CopySpec copy;
    copy.name = numbered("KXLX", c, 3);
    copy.path = "C:\\Program Files\\ZAV\\" + copy.name;
    copy.version = 9;
    copy.release = 5;
    copy.components = {"KXL Server"};
    kxlsim::addCopyRegistration(w, kxlsim::localMachine(), copy);
    extra.push_back(copy);
  }
  for (int i = 0; i + 3 < instances; ++i) {
    const kxlsim::CopySpec &copy = extra.empty() ? kxlsim::CopySpec{} : extra[i % extra.size()];
    kxlsim::InstanceRecord inst;
    inst.name = numbered("I", i, 5);
    inst.copy = extra.empty() ? "KXL95" : copy.name;
    inst.directory = (extra.empty() ? std::string(kOldCopyPath) : copy.path) + "\\" + inst.name;
    inst.version = 9;
    inst.release = 5;
    kxlsim::addInstance(w, inst);
    kxlsim::addService(w, {"", inst.name, "C:\\x\\kxlsyscs.exe", "KXL - " + inst.name, "LocalSystem", 2, 1});
  }
}

// A partitioned instance PINST of the 9.5 copy: `partitions` partitions spread
// evenly over `machines` machines (the first of them the local one).
void addPartitionedInstance(WorldWriter &w, int partitions, int machines) {
  std::vector<std::string> names = {"WINSRV1"};
  kxlsim::CopySpec old;
  old.name = "KXL95";
  old.path = kOldCopyPath;
  old.version = 9;
  old.release = 5;
  old.fixLevel = 3;
  old.components = {"KXL Server", "KXL Client"};
  kxlsim::CopySpec current = old;
  current.name = "KXL101";
  current.path = "C:\\Program Files\\ZAV\\KXL101";
  current.version = 10;
  current.release = 1;
  current.fixLevel = 0;
  for (int m = 1; m < machines; ++m) {
    kxlsim::IdentitySpec id;
    id.computerName = numbered("NODE", m, 3);
    id.fullHostName = kxlsim::posix::hive::fold(id.computerName) + ".zav.test";
    kxlsim::addMachine(w, id);
    kxlsim::addHost(w, id.fullHostName, id.fullHostName, id.computerName);
    kxlsim::addCopyRegistration(w, kxlsim::remoteMachine(id.computerName), old);
    kxlsim::addCopyRegistration(w, kxlsim::remoteMachine(id.computerName), current);
    names.push_back(id.computerName);
  }
  kxlsim::InstanceRecord inst;
  inst.name = "PINST";
  inst.copy = "KXL95";
  inst.directory = std::string(kOldCopyPath) + "\\PINST";
  inst.nodeType = 4;
  inst.version = 9;
  inst.release = 5;
  inst.profile = {{"KXLPORTRANGE", "61000:61999"}, {"KXLNODECOMPUTER", "WINSRV1"}};
  inst.machines.assign(names.begin() + 1, names.end());
  for (int p = 0; p < partitions; ++p) {
    int m = p % machines;
    std::string host = m == 0 ? "winsrv1.zav.test" : kxlsim::posix::hive::fold(names[m]) + ".zav.test";
    inst.nodesFile +=
        std::to_string(p) + " " + host + " " + names[m] + " " + std::to_string(p / machines) + " \r\n";
  }
  kxlsim::addInstance(w, inst);
  for (int p = 0; p < partitions; ++p) {
    int m = p % machines;
    std::string service = "PINST-" + std::to_string(p);
    kxlsim::addService(w, {m == 0 ? "" : names[m], service, std::string(kOldCopyPath) + "\\bin\\kxlsyscs.exe",
                           "KXL - KXL95 - " + service, ".\\kxlsvc", 2, 1});
  }
}

// Host files straight into INST1's directory: building them through the
// simulated surface would only make the world slower to build.
bool addFiles(const fs::path &world, const std::string &folder, int count, size_t size) {
  fs::path dir = world / kInstanceDir / folder;
  fs::create_directories(dir);
  std::string data(size, 'k');
  for (int i = 0; i < count; ++i) {
    FILE *f = std::fopen((dir / numbered("file", i, 5)).c_str(), "wb");
    if (f == nullptr || std::fwrite(data.data(), 1, data.size(), f) != data.size() || std::fclose(f) != 0)
      return false;
  }
  return true;
}

// ---------------------------------------------------------------- measuring

struct Measure {
  std::string row, size, what, baseline;
  // One round of each: seconds, or negative on failure.
  std::function<double()> subject;
  std::function<double()> reference;
};

double median(std::vector<double> v) {
  if (v.empty())
    return 0;
  std::sort(v.begin(), v.end());
  size_t n = v.size();
  return n % 2 ? v[n / 2] : (v[n / 2 - 1] + v[n / 2]) / 2;
}

void report(const Measure &m, int rounds) {
  std::vector<double> a, b, ratio;
  for (int r = 0; r < rounds; ++r) {
    double x = m.subject();
    double y = m.reference();
    if (x < 0 || y < 0) {
      std::printf("| %-10s | %-22s | %-26s | failed |\n", m.row.c_str(), m.size.c_str(), m.what.c_str());
      std::fflush(stdout);
      return;
    }
    a.push_back(x);
    b.push_back(y);
    ratio.push_back(x / y);
  }
  std::printf("| %-10s | %-22s | %-26s | %8.3f s | %-20s | %8.3f s | %7.2f |\n", m.row.c_str(),
              m.size.c_str(), m.what.c_str(), median(a), m.baseline.c_str(), median(b), median(ratio));
  std::fflush(stdout);
}

class Bench {
public:
  Bench(const Options &options, fs::path scratch) : options_(options), scratch_(std::move(scratch)) {}

  bool wanted(const std::string &row) const {
    return options_.only.empty() ||
           std::find(options_.only.begin(), options_.only.end(), row) != options_.only.end();
  }

  // The pristine world is kept; each upgrade runs on a fresh copy of it.
  double upgrade(const fs::path &pristine, const std::vector<std::string> &args, int expected,
                 const std::string &fail = "") {
    fs::path work = scratch_ / "work";
    run({"/bin/rm", "-rf", work.string()});
    if (!run({"/bin/cp", "-a", pristine.string(), work.string()}) || !run({"/bin/sync"}))
      return -1;
    return command(work, args, expected, fail);
  }

  double command(const fs::path &world, const std::vector<std::string> &args, int expected,
                 const std::string &fail = "") {
    std::vector<std::string> env = {"KXLSIM_ROOT=" + world.string()};
    if (!fail.empty())
      env.push_back("KXLSIM_FAIL=" + fail);
    std::vector<std::string> argv = {(world / kCommand).string()};
    argv.insert(argv.end(), args.begin(), args.end());
    return runTimed(argv, env, expected);
  }

  // `times` copies of `dir` with cp -a, timed together.
  double copies(const fs::path &dir, int times) {
    double total = 0;
    for (int i = 0; i < times; ++i) {
      fs::path target = scratch_ / "cpa";
      run({"/bin/rm", "-rf", target.string()});
      run({"/bin/sync"}); // what the last round wrote does not slow this one
      double t = runTimed({"/bin/cp", "-a", dir.string(), target.string()}, {}, 0);
      if (t < 0)
        return -1;
      total += t;
    }
    run({"/bin/rm", "-rf", (scratch_ / "cpa").string()});
    return total;
  }

  // The copies a failed upgrade makes before it gives up: `cp -a` of `dir`
  // twice (the backup and the copy to the new profile path), then the backup
  // copied back over the directory's files (the restore), timed together.
  double copiesAndRestore(const fs::path &dir) {
    double copied = copies(dir, 2);
    fs::path backup = scratch_ / "backup", restored = scratch_ / "restored";
    run({"/bin/rm", "-rf", backup.string(), restored.string()});
    if (copied < 0 || !run({"/bin/cp", "-a", dir.string(), backup.string()}) ||
        !run({"/bin/cp", "-a", dir.string(), restored.string()}) || !run({"/bin/sync"}))
      return -1;
    double restore = runTimed({"/bin/cp", "-a", (backup / ".").string(), restored.string()}, {}, 0);
    run({"/bin/rm", "-rf", backup.string(), restored.string()});
    return restore < 0 ? -1 : copied + restore;
  }

  fs::path world(const std::string &name, const std::function<void(WorldWriter &)> &extend) {
    fs::path dir = scratch_ / name;
    run({"/bin/rm", "-rf", dir.string()}); // one kept from an earlier row of the same name
    if (!buildWorld(dir, options_.sources, extend)) {
      std::fprintf(stderr, "bench: world %s not built\n", name.c_str());
      std::exit(1);
    }
    return dir;
  }

  void drop(const fs::path &dir) {
    if (std::getenv("KXL_BENCH_KEEP") == nullptr)
      run({"/bin/rm", "-rf", dir.string()});
  }

  const Options &options_;
  fs::path scratch_;
  fs::path demo_;
};

void copiesRow(Bench &b, int copies, int instances) {
  fs::path world = b.world("copies", [&](WorldWriter &w) { addCopiesAndInstances(w, copies, instances); });
  std::string size = std::to_string(copies) + " copies x " + std::to_string(instances);
  report({"copies", size, "unknown instance", "demo upgrade",
          [&] { return b.command(world, {"NOSUCH"}, 159); },
          [&] { return b.upgrade(b.demo_, {"INST1"}, 0); }},
         b.options_.rounds);
  report({"copies", size, "upgrade INST1", "demo upgrade", [&] { return b.upgrade(world, {"INST1"}, 0); },
          [&] { return b.upgrade(b.demo_, {"INST1"}, 0); }},
         b.options_.rounds);
  b.drop(world);
}

void partitionsRow(Bench &b, int partitions, int machines) {
  fs::path world =
      b.world("partitions", [&](WorldWriter &w) { addPartitionedInstance(w, partitions, machines); });
  std::string size = std::to_string(partitions) + " on " + std::to_string(machines) + " machines";
  report({"partitions", size, "upgrade PINST", "demo upgrade",
          [&] {
            return b.upgrade(world, {"-u", "kxlsvc,secret", "PINST"}, 0);
          },
          [&] { return b.upgrade(b.demo_, {"INST1"}, 0); }},
         b.options_.rounds);
  b.drop(world);
}

void filesRow(Bench &b, int files) {
  fs::path world = b.world("files", [](WorldWriter &) {});
  if (!addFiles(world, "data", files, 512))
    std::exit(1);
  report({"files", std::to_string(files) + " in one folder", "upgrade INST1", "cp -a x 2",
          [&] { return b.upgrade(world, {"INST1"}, 0); }, [&] { return b.copies(world / kInstanceDir, 2); }},
         b.options_.rounds);
  b.drop(world);
}

// `mib` MiB in all: four large files and 4,000 small ones in 40 folders.
fs::path largeWorld(Bench &b, int mib) {
  fs::path world = b.world("large", [](WorldWriter &) {});
  const size_t small = 4096;
  size_t large = (static_cast<size_t>(mib) << 20) / 4 - 100 * small;
  bool ok = addFiles(world, "big", 4, large);
  for (int f = 0; ok && f < 40; ++f)
    ok = addFiles(world, numbered("small", f, 2), 100, small);
  if (!ok)
    std::exit(1);
  return world;
}

void largeRow(Bench &b, int mib) {
  fs::path world = largeWorld(b, mib);
  report({"large", std::to_string(mib) + " MiB", "upgrade INST1", "cp -a x 2",
          [&] { return b.upgrade(world, {"INST1"}, 0); }, [&] { return b.copies(world / kInstanceDir, 2); }},
         b.options_.rounds);
  b.drop(world);
}

// The re-creation of the instance fails after both copies are made, so the
// directory is put back from the backup: three copies, as its baseline.
void failureRow(Bench &b, int mib) {
  fs::path world = largeWorld(b, mib);
  report({"failure", std::to_string(mib) + " MiB", "failed upgrade, restored", "cp -a x 2 + restore",
          [&] { return b.upgrade(world, {"INST1"}, 6, "sqlo_instance_create_extended:1"); },
          [&] { return b.copiesAndRestore(world / kInstanceDir); }},
         b.options_.rounds);
  b.drop(world);
}

bool parse(int argc, char **argv, Options &options) {
  for (int i = 1; i < argc; ++i) {
    std::string arg = argv[i];
    if (arg == "--rounds" && i + 1 < argc) {
      options.rounds = std::atoi(argv[++i]);
      if (options.rounds < 1)
        return false;
    } else if (arg == "--only" && i + 1 < argc) {
      std::string list = argv[++i];
      for (size_t start = 0; start <= list.size();) {
        size_t comma = std::min(list.find(','), list.size());
        options.only.push_back(list.substr(start, comma - start));
        if (comma == list.size())
          break;
        list[comma] = ' ';
        start = comma + 1;
      }
    } else if (arg == "--command" && i + 1 < argc) {
      options.sources.commandPath = argv[++i];
    } else if (arg == "--tools" && i + 1 < argc) {
      options.sources.toolsPath = argv[++i];
    } else if (arg == "--messages" && i + 1 < argc) {
      options.sources.messageDir = argv[++i];
    } else if (arg == "--half-only") {
      options.halfOnly = true;
    } else {
      return false;
    }
  }
  return true;
}

} // namespace

int main(int argc, char **argv) {
  Options options;
  if (!parse(argc, argv, options)) {
    std::fprintf(stderr,
                 "usage: kxl_upgrade_bench [--rounds N] [--only copies,partitions,files,large,failure] "
                 "[--half-only]\n"
                 "                         [--command PATH] [--tools PATH] [--messages DIR]\n");
    return 2;
  }
  std::string pattern = (fs::temp_directory_path() / "kxlupbench.XXXXXX").string();
  if (mkdtemp(pattern.data()) == nullptr)
    return 1;
  Bench b(options, pattern);
  if (std::getenv("KXL_BENCH_KEEP") != nullptr)
    std::fprintf(stderr, "bench: worlds kept in %s\n", pattern.c_str());
  b.demo_ = b.world("demo", [](WorldWriter &) {});
  std::printf(
      "| row        | size                   | measured                   |   median | baseline             "
      "|   median |   ratio |\n");
  std::printf(
      "|------------|------------------------|----------------------------|----------|--------------------"
      "--|----------|---------|\n");
  std::fflush(stdout);
  const int steps = options.halfOnly ? 1 : 2;
  for (int half = 1; half >= 2 - steps; --half) {
    int k = half ? 1 : 2;
    if (b.wanted("copies"))
      copiesRow(b, 25 * k, 1000 * k);
    if (b.wanted("partitions"))
      partitionsRow(b, 128 * k, 16 * k);
    if (b.wanted("files"))
      filesRow(b, 4000 * k);
    if (b.wanted("large"))
      largeRow(b, 128 * k);
    if (b.wanted("failure"))
      failureRow(b, 64 * k);
  }
  if (std::getenv("KXL_BENCH_KEEP") == nullptr)
    b.drop(pattern);
  return 0;
}
