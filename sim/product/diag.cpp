// Diagnostics: the diagnostic log (pdLog) and the trace hooks.
//
// With KXLTRACE naming a file (a host path), every hook appends one line:
//   entry 0x<id>
//   exit 0x<id> rc=<n>
//   error 0x<id> probe=<n> rc=<n>
//   data 0x<id> probe=<n> <item>
// Without it the hooks return after one cached check. Both files are host
// files outside the simulated drives, so they are written with the C run time.
#include "sim/product/diag.h"

#include "platform/kxlsys.h"
#include "sim/common/events.h"
#include "sim/common/simfail.h"

#include <cinttypes>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace kxlprod {
namespace {

constexpr std::size_t kMaxLine = 1024;
constexpr std::size_t kMaxHexBytes = 64;

struct TraceSetting {
  bool read = false;
  std::string path;
};

TraceSetting &traceSetting() {
  static TraceSetting setting;
  return setting;
}

const std::string &tracePath() {
  TraceSetting &setting = traceSetting();
  if (!setting.read) {
    const char *value = std::getenv("KXLTRACE");
    setting.path = value != nullptr ? value : "";
    setting.read = true;
  }
  return setting.path;
}

// Appends one line in a single write, so lines of several processes stay whole.
void appendLine(const std::string &path, const char *line) {
  std::FILE *file = std::fopen(path.c_str(), "ab");
  if (file == nullptr)
    return;
  std::fputs(line, file);
  std::fclose(file);
}

// A bounded line builder: text beyond kMaxLine - 2 is cut, the line feed kept.
class Line {
public:
  void add(const char *format, ...) KXL_PRINTF(2, 3) {
    va_list args;
    va_start(args, format);
    addv(format, args);
    va_end(args);
  }
  void addv(const char *format, va_list args) {
    if (used_ >= sizeof text_ - 2)
      return;
    int n = std::vsnprintf(text_ + used_, sizeof text_ - 1 - used_, format, args);
    if (n > 0)
      used_ += std::size_t(n) < sizeof text_ - 1 - used_ ? std::size_t(n) : sizeof text_ - 2 - used_;
  }
  // One data item of a hook, shown by its type.
  void addItem(uint32_t type, uint64_t size, const void *data) {
    if (data == nullptr)
      return add(" (null)");
    switch (type) {
    case PD_TYPE_STRING:
      return add(" %.*s", int(strnlen(static_cast<const char *>(data), 256)),
                 static_cast<const char *>(data));
    case PD_TYPE_INT32:
      return add(" %" PRId32, *static_cast<const int32_t *>(data));
    case PD_TYPE_UINT32:
      return add(" %" PRIu32, *static_cast<const uint32_t *>(data));
    case PD_TYPE_INT64:
      return add(" %" PRId64, *static_cast<const int64_t *>(data));
    default:
      add(" ");
      for (uint64_t i = 0; i < size && i < kMaxHexBytes; ++i)
        add("%02X", static_cast<const unsigned char *>(data)[i]);
    }
  }
  // Ends the line; line feeds inside the text become blanks.
  const char *finish() {
    for (std::size_t i = 0; i < used_; ++i) {
      if (text_[i] == '\n' || text_[i] == '\r')
        text_[i] = ' ';
    }
    text_[used_++] = '\n';
    text_[used_] = '\0';
    return text_;
  }

private:
  char text_[kMaxLine] = {};
  std::size_t used_ = 0;
};

void traceWrite(Line &line) {
  appendLine(tracePath(), line.finish());
}

void traceLine(const char *format, ...) KXL_PRINTF(1, 2);
void traceLine(const char *format, ...) {
  Line line;
  va_list args;
  va_start(args, format);
  line.addv(format, args);
  va_end(args);
  traceWrite(line);
}

// Called once by every hook: each hook is also a kill point ("trace").
bool tracing() {
  kxlsim::killPoint("trace");
  return !tracePath().empty();
}

} // namespace

void resetTrace() {
  traceSetting() = TraceSetting{};
}

std::string diagnosticLogPath() {
  std::string events = kxlsim::eventsPath();
  std::size_t cut = events.find_last_of("/\\");
  return cut == std::string::npos ? "" : events.substr(0, cut + 1) + "kxldiag.log";
}

} // namespace kxlprod

using namespace kxlprod;

extern "C" {

int32_t pdLog(uint32_t level, uint32_t functionId, uint32_t probe, int32_t rc, const char *format, ...) {
  if (kxlsim::shouldFail("pdLog"))
    return SQLO_RC_IO_ERROR;
  std::string path = diagnosticLogPath();
  if (path.empty())
    return SQLO_RC_NOT_FOUND;
  Line line;
  line.add("level=%" PRIu32 " function=0x%08" PRIX32 " probe=%" PRIu32 " rc=%" PRId32 " ", level, functionId,
           probe, rc);
  if (format != nullptr) {
    va_list args;
    va_start(args, format);
    line.addv(format, args);
    va_end(args);
  }
  return kxlsim::appendLogLine(path, line.finish()) ? 0 : SQLO_RC_IO_ERROR;
}

void pdtEntry(uint32_t functionId) {
  if (tracing())
    traceLine("entry 0x%08" PRIX32, functionId);
}

void pdtExit(uint32_t functionId, int64_t rc, uint32_t probe) {
  (void)probe;
  if (tracing())
    traceLine("exit 0x%08" PRIX32 " rc=%" PRId64, functionId, rc);
}

void pdtError(uint32_t functionId, uint32_t probe, int64_t rc) {
  if (tracing())
    traceLine("error 0x%08" PRIX32 " probe=%" PRIu32 " rc=%" PRId64, functionId, probe, rc);
}

void pdtData1(uint32_t functionId, uint32_t probe, uint32_t type, uint64_t size, const void *data) {
  if (!tracing())
    return;
  Line line;
  line.add("data 0x%08" PRIX32 " probe=%" PRIu32, functionId, probe);
  line.addItem(type, size, data);
  traceWrite(line);
}

} // extern "C"
