#pragma once

// What the volume and the input derivation do alike once a stretch is over:
// number the summaries, and send them back into the session.

#include <optional>
#include <string>
#include <vector>

#include "core/MessageDict.h"
#include "core/TalReportingSessionMessage.h"
#include "session/TalReportingSession.h"

namespace tal {

using DerivedMessages = std::vector<TalReportingSessionMessage::Pointer>;

/// The seconds under "talreporting_timestamp", nothing when absent.
std::optional<double> timestampOf(const MessageDict& message);

/// "(null)" for an absent stamp, as the log lines write it.
std::string timestampText(const std::optional<double>& timestamp);

/// The boolean under the key, false when absent.
bool flagOf(const MessageDict& values, const MessageKey& key);

/// Numbers the summaries' total into each, under "msgcnt".
void addMessageCount(DerivedMessages& summaries);

/// Sends each, in order, through the session's intake.
void sendDerived(TalReportingSession& session, const DerivedMessages& summaries);

}  // namespace tal
