#include "platform/linux/logging/JournalLogSink.h"

#include <sys/uio.h>
#include <systemd/sd-journal.h>

namespace tal {

namespace {

class JournalLogSink final : public LogSink {
 public:
  void write(std::string_view channel, LogLevel level, std::string_view line) override {
    std::vector<std::string> fields = journalFields(channel, level, line);
    std::vector<iovec> parts;
    parts.reserve(fields.size());
    for (std::string& field : fields) parts.push_back({field.data(), field.size()});
    sd_journal_sendv(parts.data(), static_cast<int>(parts.size()));
  }
};

}  // namespace

std::unique_ptr<LogSink> makeJournalLogSink() { return std::make_unique<JournalLogSink>(); }

}  // namespace tal
