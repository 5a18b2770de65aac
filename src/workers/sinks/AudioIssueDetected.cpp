#include "workers/sinks/AudioIssueDetected.h"

#include <functional>
#include <utility>

#include "core/MessageJson.h"

namespace tal::plumemetrics {

namespace {

enum Field : std::uint32_t {
  kTimestamp = 1,
  kDuration = 2,
  kIssueType = 3,
  kNode = 4,
  kRtaidClient = 5,
};

}  // namespace

void AudioIssueDetected::writeTo(ProtobufWriter& writer) const {
  if (timestamp) writer.writeUInt64(kTimestamp, *timestamp);
  writer.writeInt32(kDuration, duration);
  writer.writeBytes(kIssueType, issuetype);
  writer.writeBytes(kNode, node);
  writer.writeBytes(kRtaidClient, rtaidclient);
}

bool AudioIssueDetected::readFrom(ProtobufReader& reader) {
  while (!reader.atEnd()) {
    const ProtobufReader::Key key = reader.readKey();
    if (reader.hasError() || key.type == ProtobufWireType::kEndGroup) break;
    readField(reader, key);
  }
  return !reader.hasError();
}

void AudioIssueDetected::readField(ProtobufReader& reader, ProtobufReader::Key key) {
  const bool is_varint = key.type == ProtobufWireType::kVarint;
  if (key.field == kTimestamp && is_varint) {
    const std::uint64_t value = reader.readVarint();
    if (!reader.hasError()) timestamp = value;
    return;
  }
  if (key.field == kDuration && is_varint) {
    const auto value = static_cast<std::int32_t>(reader.readVarint());
    if (!reader.hasError()) duration = value;
    return;
  }
  std::string* const text = key.field == kIssueType     ? &issuetype
                            : key.field == kNode        ? &node
                            : key.field == kRtaidClient ? &rtaidclient
                                                        : nullptr;
  if (!text || key.type != ProtobufWireType::kLengthDelimited) return reader.skip(key);
  const std::string_view bytes = reader.readBytes();
  // Made anew: a string that grows takes more memory than its text needs.
  if (!reader.hasError()) *text = std::string(bytes);
}

void AudioIssueDetected::formatText(std::string& out) const {
  MessageDict members{
      {"duration", duration}, {"issuetype", issuetype}, {"node", node}, {"rtaidclient", rtaidclient}};
  if (timestamp) members.set("timestamp", *timestamp);
  appendJson(out, members);
}

std::size_t AudioIssueDetected::hash() const {
  std::uint64_t combined = 0;
  const auto add = [&combined](std::uint64_t part) {
    constexpr std::uint64_t kOddMultiplier = 0x9E3779B97F4A7C15;
    combined = (combined ^ part) * kOddMultiplier;
    combined ^= combined >> 32;
  };
  const std::hash<std::string> of_text;
  add(timestamp.value_or(0));
  add(static_cast<std::uint32_t>(duration));
  add(of_text(issuetype));
  add(of_text(node));
  add(of_text(rtaidclient));
  return static_cast<std::size_t>(combined);
}

void AudioIssueDetected::swap(AudioIssueDetected& other) noexcept {
  std::swap(timestamp, other.timestamp);
  std::swap(duration, other.duration);
  issuetype.swap(other.issuetype);
  node.swap(other.node);
  rtaidclient.swap(other.rtaidclient);
}

bool operator==(const AudioIssueDetected& a, const AudioIssueDetected& b) {
  return a.duration == b.duration && a.issuetype == b.issuetype && a.node == b.node &&
         a.rtaidclient == b.rtaidclient && a.timestamp == b.timestamp;
}

}  // namespace tal::plumemetrics
