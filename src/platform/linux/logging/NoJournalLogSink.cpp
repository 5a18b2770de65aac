// Stands in for JournalLogSink.cpp in a build without the journal's library.

#include "platform/linux/logging/JournalLogSink.h"

namespace tal {

std::unique_ptr<LogSink> makeJournalLogSink() { return nullptr; }

}  // namespace tal
