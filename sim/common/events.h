// The world's event log: one JSON object per line, appended to events.jsonl of
// the world (programs run, audit events). Appends from several processes never
// interleave within a line.
#pragma once

#include <string>
#include <utility>
#include <vector>

namespace kxlsim {

using EventFields = std::vector<std::pair<std::string, std::string>>;

// Appends {"event": kind, <fields as strings>...} as one line. Returns false
// when no world is found or the file cannot be written.
bool appendEvent(const std::string &kind, const EventFields &fields);

// Host path of the event log ("" when no world is found). The simulated machine
// keeps it in the world's folder; Windows in the machine's data folder
// "%ProgramData%\ZAV\KXLSIM" (or the folder KXLSIM_ROOT names), created when
// missing.
std::string eventsPath();

// Appends one whole line to a log file beside the event log (the diagnostic
// log), creating its folder when missing; false when it cannot be written.
bool appendLogLine(const std::string &path, const std::string &line);

} // namespace kxlsim
