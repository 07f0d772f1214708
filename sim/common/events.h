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

// Host path of the event log ("" when no world is found).
std::string eventsPath();

} // namespace kxlsim
