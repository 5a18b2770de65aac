// The life of one audio stream as a series of report messages.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "reporters/pipewire/Instant.h"
#include "reporters/pipewire/ReportMessage.h"
#include "reporters/pipewire/ReportingChannel.h"
#include "reporters/pipewire/StreamRules.h"
#include "reporters/pipewire/XrunEpisodes.h"

namespace tal {

enum class StreamDirection { kPlayback, kCapture };

/// Everything about a stream that a report may say, as it is at one moment.
struct StreamFacts {
  bool running = false;
  /// Absent until the application has agreed on one.
  std::optional<AudioFormat> format;
  /// The description of what the stream plays to or records from; absent while it is connected to nothing.
  std::optional<std::string> device;
  /// Linear gain from the application to the device. Playback only.
  double gain = 1.0;

  bool operator==(const StreamFacts&) const = default;
};

/// One turn of the audio graph, as one stream took part in it.
struct StreamCycle {
  std::chrono::steady_clock::time_point when;
  std::uint64_t frames = 0;
  std::chrono::duration<double> length{0};
  /// The device went without this stream's audio in this turn.
  bool xrun = false;
};

/// Tells the facts of one stream to the daemon, message by message.
///
/// The life of a stream:
///  1. Construction opens its reporting session.
///  2. update() with running facts starts a stretch: Start, with all facts.
///  3. While it runs, a change of volume or of device is a message of its own; another format
///     ends the stretch and begins the next, since only Start and Stop tell the format.
///  4. update() with facts that do not run ends the stretch: Stop. 2 to 4 repeat.
///  5. close() sends a last Stop with the figures of the whole stream and closes the session:
///     "session_duration", from construction to here, pauses included; "xrun_episodes"; and
///     "xrun_starved_seconds", the length of all turns of the graph that went without its audio.
///
/// A message that equals the last one of its kind is dropped by the daemon as redundant. That
/// never hits one of these: starts and stops bear the stretch's number, and once the first
/// Start has told device and volume, every change of them is told, also between stretches, so
/// that no two messages of that kind in a row say the same.
///
/// Lives on the main loop's thread. The channel outlives it.
class StreamSession {
 public:
  StreamSession(StreamDirection direction, const ReportedStream& stream, Instant now,
                ReportingChannel& channel);

  bool running() const { return running_; }

  /// Tells what is new in `facts`, as having happened at `now`.
  void update(const StreamFacts& facts, Instant now);

  /// Takes note of one turn of the graph; the first xrun of an episode is told. A turn may be
  /// given twice: PipeWire reports one that was not finished as such, and then as over.
  void addCycle(const StreamCycle& cycle, Instant now);

  /// The daemon lost its session and will have a fresh one: tells it about the stretch that runs.
  /// The repeated Start is dated back to the last change, since the daemon derives a summary of the
  /// time since then only from the message that ends it, which it has not had.
  void repeatStart();

  /// Ends the stream, whether it runs or not. The last call.
  void close(Instant now);

 private:
  void start(const StreamFacts& facts, Instant now);
  void stop(Instant now);
  void send(ReportCategory category, ReportType type, ReportFields fields, Instant when);
  ReportCategory startStopCategory() const;
  ReportFields startStopFields(bool running) const;

  const StreamDirection direction_;
  const Instant opened_;
  ReportingChannel& channel_;
  const std::int64_t reporterID_;

  bool running_ = false;
  std::int64_t stretchIndex_ = 0;
  /// What the daemon knows; absent before the first Start.
  std::optional<StreamFacts> told_;
  /// When the stretch began or something in it changed last.
  Instant unchangedSince_;

  /// Of the current stretch.
  std::int64_t cycles_ = 0;
  std::optional<std::uint64_t> smallestFrames_;
  /// Of the whole stream.
  XrunEpisodes xruns_;
  /// The turn that was counted last, and the one whose xrun was.
  std::optional<std::chrono::steady_clock::time_point> lastCycle_;
  std::optional<std::chrono::steady_clock::time_point> lastXrun_;
};

}  // namespace tal
