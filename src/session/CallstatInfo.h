#pragma once

// What those who open a session with the statistics back-end tell it alike.

#include <string_view>

#include "core/EventVocabulary.h"
#include "core/MessageDict.h"
#include "platform/CallstatBackend.h"

namespace tal {

inline constexpr std::string_view TalReportingClientNameTalsys{"org.vantle.talsys"};

/// Session info in the name of a reporter: messages go out in batches, or at once.
MessageDict callstatSessionInfo(ReporterID reporter_id, const CallstatToken& token, bool batched);

/// User info in the name of a reporter; the caller may add to it.
MessageDict callstatUserInfo(ReporterID reporter_id, std::string_view service_name);

}  // namespace tal
