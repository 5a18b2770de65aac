// Feeds any bytes to the daemon's decoding side as one connection would: cut
// into reads, split into frames, decoded into requests. What is accepted must
// come out the same when it is written and read again.

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>

#include "core/MessageDict.h"
#include "wire/CborWriter.h"
#include "wire/FrameSplitter.h"
#include "wire/RequestDecoder.h"

namespace tal {
namespace {

// Small, so that lengths over the limit are found.
constexpr std::uint32_t kMaxFrameBytes = 4096;

void require(bool holds) {
  if (!holds) std::abort();
}

// NaN equals nothing, so texts are compared.
void writeAndReadAgain(const MessageDict& message) {
  std::string frame;
  CborWriter(frame).dict(message);
  MessageDecoder decoder;
  decoder.begin(frame);
  MessageDict again;
  require(decoder.next() && decoder.dict(1, again) && decoder.reader().rest().empty());
  require(again.size() == message.size());
  require(again.text() == message.text());
}

void check(const Request& request, const std::optional<RequestError>& error) {
  if (error) {
    require(error->message[0] != '\0');
    require(error->code == WireErrorCode::kBadRequest || error->code == WireErrorCode::kUnknownOperation ||
            error->code == WireErrorCode::kUnsupportedVersion);
    require(error->wants_reply || error->call == 0);
    return;
  }
  if (request.operation == Operation::kSendMessage) writeAndReadAgain(request.message);
  if (request.configuration) writeAndReadAgain(*request.configuration);
}

void converse(std::string_view stream, std::size_t read_bytes) {
  FrameSplitter splitter(kMaxFrameBytes);
  RequestDecoder decoder;
  Request request;
  while (!stream.empty()) {
    const std::string_view read = stream.substr(0, read_bytes);
    stream.remove_prefix(read.size());
    splitter.feed(read);
    for (;;) {
      const FrameSplitter::Result result = splitter.next();
      if (result.status == FrameSplitter::Status::kBadLength) return;
      if (result.status == FrameSplitter::Status::kNeedsMore) break;
      require(!result.content.empty() && result.content.size() <= kMaxFrameBytes);
      check(request, decoder.decode(result.content, request));
    }
  }
}

}  // namespace
}  // namespace tal

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size == 0) return 0;
  // The first byte says how the stream is cut into reads.
  const std::string_view stream(reinterpret_cast<const char*>(data) + 1, size - 1);
  tal::converse(stream, std::size_t{data[0]} + 1);
  return 0;
}
