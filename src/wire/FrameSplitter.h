#pragma once

// Cuts the stream of bytes from a socket into frames. A frame that arrived whole
// is handed out where it lies; only the unfinished rest of a read is copied.

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

namespace tal {

/// The bytes in front of each frame: its length, unsigned, little-endian.
inline constexpr std::size_t kFrameHeaderBytes = 4;

/// The limit unless a setting moves it.
inline constexpr std::uint32_t kDefaultMaxFrameBytes = 1'048'576;

/// Splits one direction of one connection. One thread at a time.
class FrameSplitter {
 public:
  enum class Status {
    kFrame,      ///< `content` is the next frame's
    kNeedsMore,  ///< the rest of the bytes is kept; feed more
    kBadLength,  ///< 0 or over the limit: the stream cannot be followed any further
  };
  struct Result {
    Status status = Status::kNeedsMore;
    /// Valid until the next call of `next` or `feed`.
    std::string_view content;
  };

  explicit FrameSplitter(std::uint32_t max_frame_bytes = kDefaultMaxFrameBytes)
      : max_frame_bytes_(max_frame_bytes) {}

  /// Offers bytes, which stay valid until `next` has answered kNeedsMore (or
  /// kBadLength, after which nothing may be fed). Not before that.
  void feed(std::string_view bytes) { fed_ = bytes; }

  Result next();

  /// True when the bytes so far end within a frame.
  bool isMidFrame() const { return !unfinished_.empty() || !fed_.empty(); }

 private:
  Result nextWithin(std::string_view bytes) const;
  /// Completes the frame that the last reads began.
  Result finishFrame();
  void takeFed(std::size_t count);

  std::uint32_t max_frame_bytes_;
  std::string_view fed_;
  // A frame's beginning, header included; never more than one frame.
  std::string unfinished_;
  bool unfinished_handed_out_ = false;
};

}  // namespace tal
