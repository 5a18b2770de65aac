#pragma once

// Recording of performance traces.

#include <memory>
#include <optional>
#include <string>
#include <string_view>

namespace tal {

/// Told how a recording goes, on a thread of the service's own. An error is its
/// description; nothing means success.
class PerftrailDelegate {
 public:
  using Error = std::optional<std::string>;

  virtual ~PerftrailDelegate() = default;

  virtual void perftrailDidStart(const Error& error) = 0;
  virtual void perftrailDidStop(const Error& error) = 0;
  /// The recording is over: `trace_url` is where the finished trace lies, and
  /// empty on an error. `token` names the recording in the service's own words.
  virtual void perftrailDidComplete(const std::string& trace_url, std::string_view token,
                                    const Error& error) = 0;
};

/// What to record.
struct PerftrailConfiguration {
  enum class Template { kDefault = 2, kProfiling = 3 };

  Template trace_template = Template::kDefault;
  /// Of the finished trace.
  bool compression = true;
};

/// One recording. Any thread. Destroying it gives up a recording that still
/// runs; that is allowed within a callback, too.
class PerftrailSession {
 public:
  virtual ~PerftrailSession() = default;

  /// The delegate is held while it is told of something, and only then. Null:
  /// nobody is told any more.
  virtual void setDelegate(std::weak_ptr<PerftrailDelegate> delegate) = 0;
  /// Once. Answered by `perftrailDidStart`; a start that fails is the end.
  virtual void start() = 0;
  /// Answered by `perftrailDidStop` and `perftrailDidComplete`. The latter may
  /// also come unasked, when the recording breaks off.
  virtual void stop() = 0;
  /// False once the recording has ended or failed.
  virtual bool isValid() const = 0;
};

/// The host's tracer. Called on the reporting queue.
class PerftrailService {
 public:
  virtual ~PerftrailService() = default;

  virtual std::unique_ptr<PerftrailConfiguration> makeConfiguration(
      PerftrailConfiguration::Template trace_template) = 0;
  /// Never null: what keeps it from recording is told to the delegate at its start.
  virtual std::shared_ptr<PerftrailSession> makeSession(const PerftrailConfiguration& configuration) = 0;
};

}  // namespace tal
