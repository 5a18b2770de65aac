#include "wire/FrameSplitter.h"

#include <algorithm>

namespace tal {

namespace {

// A connection that sent one huge frame does not keep its buffer for ever.
constexpr std::size_t kMostBytesKeptAllocated = 16384;

std::uint32_t frameLength(std::string_view header) {
  std::uint32_t length = 0;
  for (std::size_t i = 0; i < kFrameHeaderBytes; ++i) {
    length |= static_cast<std::uint32_t>(static_cast<unsigned char>(header[i])) << (8 * i);
  }
  return length;
}

}  // namespace

FrameSplitter::Result FrameSplitter::next() {
  if (unfinished_handed_out_) {
    unfinished_handed_out_ = false;
    unfinished_.clear();
    if (unfinished_.capacity() > kMostBytesKeptAllocated) unfinished_.shrink_to_fit();
  }
  if (!unfinished_.empty()) return finishFrame();

  const Result result = nextWithin(fed_);
  if (result.status == Status::kFrame) {
    fed_.remove_prefix(kFrameHeaderBytes + result.content.size());
  } else if (result.status == Status::kNeedsMore) {
    takeFed(fed_.size());
  }
  return result;
}

FrameSplitter::Result FrameSplitter::nextWithin(std::string_view bytes) const {
  if (bytes.size() < kFrameHeaderBytes) return {};
  const std::uint32_t length = frameLength(bytes);
  if (length == 0 || length > max_frame_bytes_) return {Status::kBadLength, {}};
  if (bytes.size() - kFrameHeaderBytes < length) return {};
  return {Status::kFrame, bytes.substr(kFrameHeaderBytes, length)};
}

FrameSplitter::Result FrameSplitter::finishFrame() {
  // The header first: it says how much more belongs to this frame.
  if (unfinished_.size() < kFrameHeaderBytes) {
    takeFed(std::min(fed_.size(), kFrameHeaderBytes - unfinished_.size()));
  }
  if (unfinished_.size() >= kFrameHeaderBytes) {
    const std::uint32_t length = frameLength(unfinished_);
    if (length != 0 && length <= max_frame_bytes_) {
      takeFed(std::min(fed_.size(), kFrameHeaderBytes + length - unfinished_.size()));
    }
  }
  const Result result = nextWithin(unfinished_);
  unfinished_handed_out_ = result.status == Status::kFrame;
  return result;
}

void FrameSplitter::takeFed(std::size_t count) {
  unfinished_.append(fed_.substr(0, count));
  fed_.remove_prefix(count);
}

}  // namespace tal
