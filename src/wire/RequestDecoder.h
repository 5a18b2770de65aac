#pragma once

// Turns the content of a frame into a checked request: the one place where what
// a client sent is looked at before it is trusted.

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>

#include "wire/MessageDecoder.h"
#include "wire/Request.h"

namespace tal {

/// One per connection; one thread at a time.
class RequestDecoder {
 public:
  /// Decodes into `request`, whose former content is lost. With an error
  /// `request` is not to be used.
  std::optional<RequestError> decode(std::string_view frame, Request& request);

 private:
  // Of the frame being decoded. The methods below return false after
  // `decoder_.fail`, and `code_` then is the error's.
  bool wholeRequest(Request& request);
  bool operationAndCall(std::optional<std::uint64_t>& operation);
  bool unknownOperation(std::optional<std::size_t> count);
  bool arguments(Operation operation, std::optional<std::size_t> count, Request& request);
  bool argument(Operation operation, std::size_t index, Request& request);
  bool helloArgument(std::size_t index, Request& request);
  bool messageArgument(std::size_t index, Request& request);
  bool options(Request& request);
  bool option(Request& request);
  bool reporterIDs(Request& request);
  bool reporterID(ReporterID& out);
  bool unsignedUpTo(std::uint64_t most, std::uint64_t& out);
  bool atEnd();

  MessageDecoder decoder_;
  WireErrorCode code_ = WireErrorCode::kBadRequest;
  std::optional<std::uint64_t> call_;
  std::uint64_t version_ = kProtocolVersion;
};

}  // namespace tal
