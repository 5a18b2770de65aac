// A channel that writes down, one line per call, what a stream's report says.
#pragma once

#include <cstdint>
#include <sstream>
#include <string>
#include <utility>
#include <variant>
#include <vector>

#include "reporters/pipewire/ReportingChannel.h"

namespace tal {

class RecordingChannel final : public ReportingChannel {
 public:
  struct Sent {
    std::int64_t reporterID;
    ReportMessage message;
  };

  /// "open 1 7 player" with the service type, "1 Playback/Start key=value …", "close 1".
  std::vector<std::string> lines;
  std::vector<Sent> sent;

  std::int64_t openSession(const ReportedStream& stream) override {
    lines.push_back("open " + std::to_string(++last_) + " " +
                    std::to_string(static_cast<int>(stream.serviceType)) + " " + stream.applicationName);
    return last_;
  }
  void sendMessage(std::int64_t reporterID, const ReportMessage& message) override {
    std::ostringstream line;
    line << reporterID << " " << nameOf(message.category) << "/" << nameOf(message.type);
    for (const auto& [key, value] : message.fields) line << " " << key << "=" << text(value);
    lines.push_back(line.str());
    sent.push_back({reporterID, message});
  }
  void closeSession(std::int64_t reporterID) override {
    lines.push_back("close " + std::to_string(reporterID));
  }

  /// The lines since the last call.
  std::vector<std::string> takeLines() { return std::exchange(lines, {}); }

 private:
  static std::string nameOf(ReportCategory category) {
    switch (category) {
      case ReportCategory::kRecord:
        return "Record";
      case ReportCategory::kPlayback:
        return "Playback";
      case ReportCategory::kIo:
        return "IO";
      case ReportCategory::kRouteChange:
        return "RouteChange";
      case ReportCategory::kVolume:
        return "Volume";
    }
    return "?";
  }
  static std::string nameOf(ReportType type) {
    switch (type) {
      case ReportType::kGeneric:
        return "Generic";
      case ReportType::kStart:
        return "Start";
      case ReportType::kStop:
        return "Stop";
      case ReportType::kError:
        return "Error";
    }
    return "?";
  }
  static std::string text(const ReportValue& value) {
    std::ostringstream out;
    out.precision(12);
    std::visit([&](const auto& alternative) { out << std::boolalpha << alternative; }, value);
    return out.str();
  }

  std::int64_t last_ = 0;
};

}  // namespace tal
