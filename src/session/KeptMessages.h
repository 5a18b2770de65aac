#pragma once

// The messages that a session keeps, with the index that finds the last one of a
// kind in constant time.

#include <cstddef>
#include <cstdint>
#include <unordered_map>
#include <vector>

#include "core/TalReportingSessionMessage.h"

namespace tal {

/// The kept messages of one session. Lives on the reporting queue.
class KeptMessages {
 public:
  /// `owner_bytes` counts the memory held by all lists of one owner; outlives this.
  explicit KeptMessages(std::size_t& owner_bytes) : owner_bytes_(owner_bytes) {}
  KeptMessages(const KeptMessages&) = delete;
  KeptMessages& operator=(const KeptMessages&) = delete;
  ~KeptMessages() { clear(); }

  const std::vector<TalReportingSessionMessage::Pointer>& messages() const { return messages_; }

  void append(TalReportingSessionMessage::Pointer message);

  /// The record that a walk from the end would meet first, or null. Valid until
  /// the list changes.
  const TalReportingSessionMessage* lastOfKind(AudioEventCategory category, AudioEventType type) const;

  void sort();
  void clear();

  std::size_t bytes() const { return bytes_; }

 private:
  static std::uint64_t kindOf(AudioEventCategory category, AudioEventType type) {
    return (std::uint64_t{static_cast<std::uint32_t>(category)} << 16) | static_cast<std::uint16_t>(type);
  }

  std::size_t& owner_bytes_;
  std::size_t bytes_ = 0;
  std::vector<TalReportingSessionMessage::Pointer> messages_;
  std::unordered_map<std::uint64_t, const TalReportingSessionMessage*> last_of_kind_;
};

}  // namespace tal
