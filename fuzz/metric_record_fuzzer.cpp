// Feeds any bytes to the decoder of metric records. Whatever was read, wholly or
// up to an error, must come out the same when it is written and read again.

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>

#include "workers/sinks/AudioIssueDetected.h"

namespace tal {
namespace {

using plumemetrics::AudioIssueDetected;

void require(bool holds) {
  if (!holds) std::abort();
}

// Beyond what every text has room for, no more memory than the input has bytes.
void requireModest(const std::string& text, std::size_t input_bytes) {
  require(text.capacity() <= std::string().capacity() || text.capacity() < input_bytes);
}

void readAndWrite(std::string_view input) {
  AudioIssueDetected record;
  ProtobufReader reader(input);
  const bool whole = record.readFrom(reader);
  require(whole == !reader.hasError());
  requireModest(record.issuetype, input.size());
  requireModest(record.node, input.size());
  requireModest(record.rtaidclient, input.size());

  std::string bytes;
  ProtobufWriter writer(bytes);
  record.writeTo(writer);
  AudioIssueDetected again;
  ProtobufReader second(bytes);
  require(again.readFrom(second) && second.atEnd());
  require(again == record && again.hash() == record.hash());

  std::string text;
  record.formatText(text);
  require(text.starts_with("{\"duration\":") && text.ends_with('}'));
}

}  // namespace
}  // namespace tal

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  tal::readAndWrite({reinterpret_cast<const char*>(data), size});
  return 0;
}
