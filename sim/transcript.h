// The readable form of an event log: one aligned line per event and a
// summary at the end, for people following what the add-in did.
#pragma once

#include <string>
#include <vector>

#include "sim/event_log.h"

namespace kpx::sim {

// A value of the log written short: $app, "text", 12, True, Empty, Nothing ...
std::string ShortValue(const EventJson& value);

// One line (without its line break) for one event.
std::string TranscriptLine(const EventJson& event);

// All lines, then the summary. `title` heads the text.
std::string Transcript(const std::vector<EventJson>& events, const std::string& title);

}  // namespace kpx::sim
