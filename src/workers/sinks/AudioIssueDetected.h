#pragma once

// The record that wireless diagnostics count audio issues by. Its layout is
// fixed: docs/plumemetrics.proto describes it for other programs.

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>

#include "core/ProtobufMessage.h"

namespace tal::plumemetrics {

/// One audio issue. A plain value.
class AudioIssueDetected final : public ProtobufMessage {
 public:
  /// The number that metric services know the record by.
  static constexpr std::uint32_t kMetric = 0x5B0003;

  std::optional<std::uint64_t> timestamp;  ///< Time of the issue; this program never sets it.
  std::int32_t duration = 0;               ///< Seconds of silence on any channel.
  std::string issuetype;                   ///< Kind of issue.
  std::string node;                        ///< Where in the signal chain it was seen.
  std::string rtaidclient;                 ///< The client that detected it.

  /// All fields but `timestamp` are written even when they are zero or empty.
  void writeTo(ProtobufWriter& writer) const override;
  void formatText(std::string& out) const override;
  /// Also ends, without an error, at the end of a group that the record stands in.
  bool readFrom(ProtobufReader& reader) override;

  /// Equal for equal records of one process.
  std::size_t hash() const;

  void swap(AudioIssueDetected& other) noexcept;

  friend bool operator==(const AudioIssueDetected& a, const AudioIssueDetected& b);

 private:
  void readField(ProtobufReader& reader, ProtobufReader::Key key);
};

inline void swap(AudioIssueDetected& a, AudioIssueDetected& b) noexcept { a.swap(b); }

}  // namespace tal::plumemetrics
