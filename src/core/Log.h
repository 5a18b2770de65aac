#pragma once

// The log facility: named channels, four levels, and a line whose level is off
// costs one comparison. Everything that logs is handed its channel; where the
// lines go is the sink's business.

#include <cstdint>
#include <string>
#include <string_view>
#include <type_traits>

namespace tal {

enum class LogLevel : std::uint8_t { kError, kDefault, kInfo, kDebug };

/// "error", "default", "info" or "debug".
std::string_view logLevelName(LogLevel level);

/// Where finished lines go. Called on any thread; must not call back into the
/// code that logs.
class LogSink {
 public:
  virtual ~LogSink() = default;

  /// `line` is the whole text, source prefix included, without a line end. It
  /// may hold control characters that came from a client: the sink escapes them.
  virtual void write(std::string_view channel, LogLevel level, std::string_view line) = 0;
};

/// One named channel of the subsystem "org.vantle.talsys". Any thread.
class LogChannel {
 public:
  /// `name` and `sink` must outlive the channel; without a sink it is silent.
  LogChannel(std::string_view name, LogSink* sink, LogLevel most_detailed)
      : name_(name), sink_(sink), most_detailed_(sink ? most_detailed : LogLevel::kError), silent_(!sink) {}

  bool enabled(LogLevel level) const { return level <= most_detailed_ && !silent_; }
  std::string_view name() const { return name_; }

  /// Writes one line made of the parts in turn, behind the source prefix
  /// "%25s:%-5d ". Use the macros below, which ask `enabled` first.
  template <typename... Parts>
  void write(LogLevel level, std::string_view file, int line, const Parts&... parts) const {
    std::string text = sourcePrefix(file, line);
    (appendPart(text, parts), ...);
    sink_->write(name_, level, text);
  }

 private:
  static std::string sourcePrefix(std::string_view file, int line);

  static void appendPart(std::string& out, std::string_view text) { out += text; }
  static void appendPart(std::string& out, const char* text) { out += text; }
  static void appendPart(std::string& out, const std::string& text) { out += text; }
  static void appendPart(std::string& out, char character) { out += character; }
  static void appendPart(std::string& out, bool value) { out += value ? '1' : '0'; }
  static void appendPart(std::string& out, double value) { out += std::to_string(value); }
  template <typename Integer>
  requires std::is_integral_v<Integer>
  static void appendPart(std::string& out, Integer value) { out += std::to_string(value); }

  std::string_view name_;
  LogSink* sink_;
  LogLevel most_detailed_;
  bool silent_;
};

/// The twelve channels, made once and handed down.
struct LogChannels {
  explicit LogChannels(LogSink* sink, LogLevel most_detailed = LogLevel::kDefault);

  LogChannel client;              ///< "talrc": client-side helpers
  LogChannel service;             ///< "talrs": service and client connections
  LogChannel session;             ///< "talrr": sessions, message records, utilities
  LogChannel callstat;            ///< "talri": real-time-communication statistics
  LogChannel driver_utility;      ///< "talrd": driver statistics
  LogChannel trace;               ///< "talrt": trace worker
  LogChannel energylog;           ///< "talrp": power log
  LogChannel plume;               ///< "talra": wireless diagnostics
  LogChannel hound;               ///< "talrb": bug capture
  LogChannel summary;             ///< "talru": summary workers
  LogChannel flutter;             ///< "talrl": hang traces
  LogChannel audio_registration;  ///< "talrz": accessory registration
};

}  // namespace tal

// The arguments are not evaluated when the level is off.
#define TAL_LOG_AT(channel, level, ...)                          \
  do {                                                           \
    if ((channel).enabled(level)) {                              \
      (channel).write((level), __FILE__, __LINE__, __VA_ARGS__); \
    }                                                            \
  } while (false)

#define TAL_LOG_ERROR(channel, ...) TAL_LOG_AT(channel, ::tal::LogLevel::kError, __VA_ARGS__)
#define TAL_LOG(channel, ...) TAL_LOG_AT(channel, ::tal::LogLevel::kDefault, __VA_ARGS__)
#define TAL_LOG_INFO(channel, ...) TAL_LOG_AT(channel, ::tal::LogLevel::kInfo, __VA_ARGS__)
#define TAL_LOG_DEBUG(channel, ...) TAL_LOG_AT(channel, ::tal::LogLevel::kDebug, __VA_ARGS__)
