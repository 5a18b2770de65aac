#pragma once

// Stored events as people and as programs read them.

#include <string>

#include "tools/talctl/EventStore.h"
#include "tools/talctl/Terminal.h"

namespace tal::talctl {

/// On a terminal, the time (the user's time zone) and the name, and the payload
/// as key=value wrapped below; else all in one line. Ends with "\n".
std::string eventText(const StoredEvent& event, const Terminal& terminal);

/// One line: {"id", "recorded_at", "name", "payload"}.
std::string eventJson(const StoredEvent& event);

}  // namespace tal::talctl
