#include "NT/runrecord.h"

#include "NT/kxliutil.h"
#include "NT/pathjoin.h"
#include "install/iutil.h"
#include "install/kxlinstance.h"
#include "platform/kxlsys.h"
#include "platform/win32.h"
#include "upgrade/records.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <map>
#include <string>

namespace {

constexpr char kHeader[] = "KXLIUPGRADE run record 1";
constexpr char kEnd[] = "end";
constexpr uint32_t kMaxRecordSize = 16384;

// A text of the record: where it lives in the run and how big its buffer is.
struct TextField {
  const char *key;
  char *(*at)(DriverState &);
  std::size_t size;
};

const TextField kTexts[] = {
    {"instance", [](DriverState &s) { return s.instanceName; }, SQLO_INSTANCE_NAME_SZ},
    {"oldCopy", [](DriverState &s) { return s.oldCopyName; }, SQLO_COPY_NAME_SZ},
    {"currentCopy", [](DriverState &s) { return s.currentCopyName; }, SQLO_COPY_NAME_SZ},
    {"instanceDir", [](DriverState &s) { return s.instanceDir; }, KXL_JOINED_PATH_SZ},
    {"savedInstanceDir", [](DriverState &s) { return s.savedInstanceDir; }, KXL_JOINED_PATH_SZ},
    {"backupDir", [](DriverState &s) { return s.backupDir; }, KXL_JOINED_PATH_SZ},
    {"profileCopyDir", [](DriverState &s) { return s.profileCopyDir; }, KXL_JOINED_PATH_SZ},
    {"newFunctionDir", [](DriverState &s) { return s.newFunctionDir; }, KXL_JOINED_PATH_SZ},
    {"auditFile", [](DriverState &s) { return s.auditFile; }, KXL_JOINED_PATH_SZ},
    {"auditCopyFile", [](DriverState &s) { return s.auditCopyFile; }, KXL_JOINED_PATH_SZ},
    {"profilePath", [](DriverState &s) { return s.options.profilePath; },
     sizeof(UpgradeOptions::profilePath)},
    {"var159Head", [](DriverState &s) { return s.context.var159Head; }, UPGRADE_VAR159_SZ},
    {"var159Tail", [](DriverState &s) { return s.context.var159Tail; }, UPGRADE_VAR159_SZ},
};

// A number of the record: read and set through the run's own field.
struct NumberField {
  const char *key;
  uint32_t (*get)(const DriverState &);
  void (*set)(DriverState &, uint32_t);
};

const NumberField kNumbers[] = {
    {"nodeType", [](const DriverState &s) { return s.nodeType; },
     [](DriverState &s, uint32_t v) { s.nodeType = v; }},
    {"boundNodeType", [](const DriverState &s) { return s.context.nodeType; },
     [](DriverState &s, uint32_t v) { s.context.nodeType = v; }},
    {"flags", [](const DriverState &s) { return uint32_t(s.options.flags); },
     [](DriverState &s, uint32_t v) { s.options.flags = uint16_t(v); }},
    {"partitioned", [](const DriverState &s) { return uint32_t(s.options.partitionedInstance); },
     [](DriverState &s, uint32_t v) { s.options.partitionedInstance = uint8_t(v); }},
    {"clustered", [](const DriverState &s) { return uint32_t(s.context.instance->isClustered); },
     [](DriverState &s, uint32_t v) { s.clustered = v != 0; }},
    {"startType", [](const DriverState &s) { return uint32_t(s.context.serviceStartType); },
     [](DriverState &s, uint32_t v) { s.context.serviceStartType = int32_t(v); }},
    {"profilePathCreated", [](const DriverState &s) { return uint32_t(s.profilePathCreated); },
     [](DriverState &s, uint32_t v) { s.profilePathCreated = v != 0; }},
    {"profileMoved", [](const DriverState &s) { return uint32_t(s.profileMoved); },
     [](DriverState &s, uint32_t v) { s.profileMoved = v != 0; }},
    {"backupChosen", [](const DriverState &s) { return uint32_t(s.backupChosen); },
     [](DriverState &s, uint32_t v) { s.backupChosen = v != 0; }},
    {"backupComplete", [](const DriverState &s) { return uint32_t(s.backupComplete); },
     [](DriverState &s, uint32_t v) { s.backupComplete = v != 0; }},
    {"clusterTypeRegistered", [](const DriverState &s) { return uint32_t(s.clusterJournal.typeRegistered); },
     [](DriverState &s, uint32_t v) { s.clusterJournal.typeRegistered = v != 0; }},
};

bool addLine(std::string &text, const char *key, const char *value) {
  if (std::strpbrk(value, "\r\n") != nullptr)
    return false;
  text.append(key).append("=").append(value).append("\n");
  return true;
}

bool writeWhole(const char *path, const std::string &text) {
  HANDLE file = CreateFileA(path, GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS, FILE_ATTRIBUTE_NORMAL, nullptr);
  if (file == INVALID_HANDLE_VALUE)
    return false;
  DWORD written = 0;
  BOOL ok = WriteFile(file, text.data(), DWORD(text.size()), &written, nullptr);
  ok = CloseHandle(file) && ok;
  return ok && written == text.size();
}

bool readWhole(const char *path, std::string &text, bool &missing) {
  missing = false;
  HANDLE file = CreateFileA(path, GENERIC_READ, FILE_SHARE_READ, nullptr, OPEN_EXISTING,
                            FILE_ATTRIBUTE_NORMAL, nullptr);
  if (file == INVALID_HANDLE_VALUE) {
    DWORD error = GetLastError();
    missing = kxliIsMissing(static_cast<LONG>(error));
    return false;
  }
  char buffer[kMaxRecordSize];
  DWORD got = 0;
  BOOL ok = ReadFile(file, buffer, sizeof buffer, &got, nullptr);
  CloseHandle(file);
  if (!ok || got >= sizeof buffer)
    return false;
  text.assign(buffer, got);
  return true;
}

// key -> value of a whole record; false when it is not one.
bool parseRecord(const std::string &text, std::map<std::string, std::string> &values) {
  std::size_t at = 0;
  bool first = true, ended = false;
  while (at < text.size()) {
    std::size_t end = text.find('\n', at);
    if (end == std::string::npos || ended)
      return false;
    std::string line = text.substr(at, end - at);
    at = end + 1;
    if (first) {
      if (line != kHeader)
        return false;
      first = false;
    } else if (line == kEnd) {
      ended = true;
    } else {
      std::size_t equals = line.find('=');
      if (equals == std::string::npos ||
          !values.emplace(line.substr(0, equals), line.substr(equals + 1)).second)
        return false;
    }
  }
  return ended;
}

bool parseNumber(const std::string &text, uint32_t &value) {
  if (text.empty() || text.size() > 10 || text.find_first_not_of("0123456789") != std::string::npos)
    return false;
  unsigned long long number = std::strtoull(text.c_str(), nullptr, 10);
  value = uint32_t(number);
  return number <= 0xFFFFFFFFull;
}

// The cluster step's journal: a count, then per resource its name, group,
// type, monitor and dependencies under keys numbered from 0.
std::string numberedKey(const char *stem, std::size_t index) {
  return stem + std::to_string(index);
}

std::string dependencyKey(std::size_t resource, std::size_t dependency) {
  return numberedKey("clusterDependency", resource) + "." + std::to_string(dependency);
}

bool addNumber(std::string &text, const std::string &key, std::size_t value) {
  return addLine(text, key.c_str(), std::to_string(value).c_str());
}

bool clusterText(const ClusterJournal &journal, std::string &text) {
  bool ok = addNumber(text, "clusterResources", journal.resources.size());
  for (std::size_t i = 0; ok && i < journal.resources.size(); ++i) {
    const ClusterResourceFacts &resource = journal.resources[i];
    ok = addLine(text, numberedKey("clusterResource", i).c_str(), resource.entry.name) &&
         addLine(text, numberedKey("clusterGroup", i).c_str(), resource.entry.group) &&
         addLine(text, numberedKey("clusterType", i).c_str(), resource.type) &&
         addNumber(text, numberedKey("clusterMonitor", i), resource.separateMonitor ? 1 : 0) &&
         addNumber(text, numberedKey("clusterDependencies", i), resource.dependencies.size());
    for (std::size_t j = 0; ok && j < resource.dependencies.size(); ++j)
      ok = addLine(text, dependencyKey(i, j).c_str(), resource.dependencies[j].name);
  }
  return ok;
}

// A text of the record into a field of `size` bytes; false when missing or too long.
bool takeText(const std::map<std::string, std::string> &values, const std::string &key, char *field,
              std::size_t size) {
  auto found = values.find(key);
  if (found == values.end() || found->second.size() >= size)
    return false;
  std::memcpy(field, found->second.c_str(), found->second.size() + 1);
  return true;
}

bool takeNumber(const std::map<std::string, std::string> &values, const std::string &key, uint32_t &value) {
  auto found = values.find(key);
  return found != values.end() && parseNumber(found->second, value);
}

// Counts beyond this are not a record this command wrote.
constexpr uint32_t kMaxJournalEntries = 4096;

bool readClusterJournal(const std::map<std::string, std::string> &values, ClusterJournal &journal) {
  uint32_t count = 0;
  if (!takeNumber(values, "clusterResources", count) || count > kMaxJournalEntries)
    return false;
  journal.resources.assign(count, ClusterResourceFacts{});
  for (std::size_t i = 0; i < count; ++i) {
    ClusterResourceFacts &resource = journal.resources[i];
    uint32_t monitor = 0, dependencies = 0;
    resource.exists = true;
    if (!takeText(values, numberedKey("clusterResource", i), resource.entry.name, kClusterNameChars) ||
        !takeText(values, numberedKey("clusterGroup", i), resource.entry.group, kClusterNameChars) ||
        !takeText(values, numberedKey("clusterType", i), resource.type, kClusterNameChars) ||
        !takeNumber(values, numberedKey("clusterMonitor", i), monitor) || monitor > 1 ||
        !takeNumber(values, numberedKey("clusterDependencies", i), dependencies) ||
        dependencies > kMaxJournalEntries)
      return false;
    resource.separateMonitor = monitor != 0;
    resource.dependencies.assign(dependencies, ClusterResourceEntry{});
    for (std::size_t j = 0; j < dependencies; ++j)
      if (!takeText(values, dependencyKey(i, j), resource.dependencies[j].name, kClusterNameChars))
        return false;
  }
  return true;
}

bool recordText(DriverState &state, std::string &text) {
  text = std::string(kHeader) + "\n";
  bool ok = addLine(text, "step", std::to_string(state.step).c_str());
  for (const TextField &field : kTexts)
    ok = ok && addLine(text, field.key, field.at(state));
  for (const NumberField &field : kNumbers)
    ok = ok && addLine(text, field.key, std::to_string(field.get(state)).c_str());
  ok = ok && clusterText(state.clusterJournal, text);
  text.append(kEnd).append("\n");
  return ok;
}

} // namespace

void runRecordPath(char *buffer, const char *currentCopyPath, const char *instanceName) {
  char name[64];
  std::snprintf(name, sizeof name, "cfg\\kxliupgrade-%.8s.run", instanceName);
  joinPath(buffer, currentCopyPath, name);
}

bool writeRunRecord(DriverState &state) {
  std::string text;
  char temporary[KXL_JOINED_PATH_SZ + 4];
  std::snprintf(temporary, sizeof temporary, "%s.new", state.recordPath);
  if (state.recordPath[0] == '\0' || std::strlen(temporary) >= KXL_JOINED_PATH_SZ || !recordText(state, text))
    return false;
  // The record is replaced whole or not at all; a new text that did not make it goes again.
  if (writeWhole(temporary, text) &&
      MoveFileExA(temporary, state.recordPath, MOVEFILE_REPLACE_EXISTING | MOVEFILE_WRITE_THROUGH))
    return true;
  DeleteFileA(temporary);
  return false;
}

bool removeRunRecordFile(const char *path) {
  for (int attempt = 0; attempt < 2; ++attempt)
    if (DeleteFileA(path) || GetLastError() == ERROR_FILE_NOT_FOUND)
      return true;
  return false;
}

void closeRunRecord(DriverState &state) {
  if (state.recordPath[0] == '\0')
    return;
  state.step = kRunRecordEnded;
  writeRunRecord(state);
  if (!removeRunRecordFile(state.recordPath))
    pdLog(PD_LEVEL_WARNING, KXL_FN_UPGRADE_INSTANCE, kProbeRunRecord, 0,
          "the record %s of this run, which has ended, could not be removed", state.recordPath);
}

RecordRead readRunRecord(const char *path, DriverState &state) {
  std::string text;
  bool missing = false;
  if (!readWhole(path, text, missing))
    return missing ? RecordRead::none : RecordRead::damaged;
  std::map<std::string, std::string> values;
  if (!parseRecord(text, values) || !parseNumber(values["step"], state.step))
    return RecordRead::damaged;
  for (const TextField &field : kTexts)
    if (!takeText(values, field.key, field.at(state), field.size))
      return RecordRead::damaged;
  for (const NumberField &field : kNumbers) {
    uint32_t value = 0;
    if (!takeNumber(values, field.key, value))
      return RecordRead::damaged;
    field.set(state, value);
  }
  if (!readClusterJournal(values, state.clusterJournal))
    return RecordRead::damaged;
  std::memcpy(state.recordPath, path, std::strlen(path) + 1);
  return RecordRead::read;
}

void setRunRecordAside(const char *path) {
  char aside[KXL_JOINED_PATH_SZ + 16];
  std::snprintf(aside, sizeof aside, "%s.damaged", path);
  if (!MoveFileExA(path, aside, MOVEFILE_REPLACE_EXISTING))
    DeleteFileA(path);
}
