#include "wire/RequestDecoder.h"

#include <array>
#include <limits>

namespace tal {

namespace {

using Kind = CborItem::Kind;

// Containers that are open around an argument: the request's array.
constexpr unsigned kOpenAroundArguments = 1;
constexpr std::size_t kOperationAndCall = 2;

struct ArgumentCount {
  std::size_t least;
  std::size_t most;
};
// By operation number.
constexpr std::array<ArgumentCount, 12> kArgumentCounts = {
    {{1, 2}, {1, 1}, {2, 2}, {1, 1}, {2, 2}, {1, 1}, {4, 4}, {1, 1}, {1, 1}, {1, 1}, {0, 0}, {0, 0}}};

constexpr const char* kWrongCount = "wrong number of arguments";

}  // namespace

std::optional<RequestError> RequestDecoder::decode(std::string_view frame, Request& request) {
  decoder_.begin(frame);
  code_ = WireErrorCode::kBadRequest;
  call_.reset();
  version_ = kProtocolVersion;
  request.configuration.reset();
  request.reporter_ids.clear();
  request.durable = false;

  if (wholeRequest(request)) return std::nullopt;
  RequestError error;
  error.code = code_;
  error.call = call_.value_or(0);
  error.wants_reply = !call_ || *call_ != 0;
  error.message = decoder_.error();
  return error;
}

bool RequestDecoder::wholeRequest(Request& request) {
  if (!decoder_.next()) return false;
  std::optional<std::size_t> count;
  if (!decoder_.isArray()) return decoder_.fail("a request is an array");
  if (!decoder_.count(count)) return false;
  if (count && *count < kOperationAndCall) return decoder_.fail("a request has an operation and a call");

  std::optional<std::uint64_t> operation;
  if (!operationAndCall(operation)) return false;
  if (!operation) return decoder_.fail("the operation is not an unsigned integer");
  request.call = *call_;
  if (count) *count -= kOperationAndCall;
  if (*operation >= kArgumentCounts.size()) return unknownOperation(count);

  request.operation = static_cast<Operation>(*operation);
  if (!arguments(request.operation, count, request) || !atEnd()) return false;
  if (version_ == kProtocolVersion) return true;
  code_ = WireErrorCode::kUnsupportedVersion;
  return decoder_.fail("the only version spoken here is 1");
}

// With a bad operation the call is still looked for: the reply shall bear it.
bool RequestDecoder::operationAndCall(std::optional<std::uint64_t>& operation) {
  if (!decoder_.next()) return false;
  if (decoder_.item().kind == Kind::kUnsigned) {
    operation = decoder_.item().number;
  } else if (!decoder_.skip(kOpenAroundArguments)) {
    return false;
  }
  if (!decoder_.next()) return false;
  if (decoder_.item().kind != Kind::kUnsigned) return decoder_.fail("the call is not an unsigned integer");
  call_ = decoder_.item().number;
  return true;
}

bool RequestDecoder::unknownOperation(std::optional<std::size_t> count) {
  for (std::size_t i = 0; !count || i < *count; ++i) {
    if (!decoder_.next()) return false;
    if (!count && decoder_.item().kind == Kind::kBreak) break;
    if (!decoder_.skip(kOpenAroundArguments)) return false;
  }
  if (!atEnd()) return false;
  code_ = WireErrorCode::kUnknownOperation;
  return decoder_.fail("unknown operation");
}

bool RequestDecoder::arguments(Operation operation, std::optional<std::size_t> count, Request& request) {
  const ArgumentCount allowed = kArgumentCounts[static_cast<std::size_t>(operation)];
  if (count && (*count < allowed.least || *count > allowed.most)) return decoder_.fail(kWrongCount);
  for (std::size_t index = 0; !count || index < *count; ++index) {
    if (!decoder_.next()) return false;
    if (!count && decoder_.item().kind == Kind::kBreak) {
      return index >= allowed.least || decoder_.fail(kWrongCount);
    }
    if (index >= allowed.most) return decoder_.fail(kWrongCount);
    if (!argument(operation, index, request)) return false;
  }
  return true;
}

// The item just read is, or begins, the argument.
bool RequestDecoder::argument(Operation operation, std::size_t index, Request& request) {
  switch (operation) {
    case Operation::kSendMessage:
      return messageArgument(index, request);
    case Operation::kHello:
      return helloArgument(index, request);
    case Operation::kSetServiceType: {
      if (index != 0) return reporterID(request.reporter_id);
      std::uint64_t type = 0;
      if (!unsignedUpTo(std::numeric_limits<std::uint16_t>::max(), type)) return false;
      request.service_type = static_cast<AudioServiceType>(type);
      return true;
    }
    case Operation::kSetConfiguration:
      if (index != 0) return reporterID(request.reporter_id);
      if (decoder_.item().kind == Kind::kNull) return true;
      return decoder_.dict(kOpenAroundArguments, request.configuration.emplace());
    default:
      return reporterID(request.reporter_id);
  }
}

bool RequestDecoder::messageArgument(std::size_t index, Request& request) {
  std::uint64_t number = 0;
  switch (index) {
    case 0:
      return decoder_.dict(kOpenAroundArguments, request.message);
    case 1:
      if (!unsignedUpTo(std::numeric_limits<std::uint32_t>::max(), number)) return false;
      request.category = static_cast<AudioEventCategory>(number);
      return true;
    case 2:
      if (!unsignedUpTo(std::numeric_limits<std::uint16_t>::max(), number)) return false;
      request.type = static_cast<AudioEventType>(number);
      return true;
    default:
      return decoder_.item().kind == Kind::kNull || reporterIDs(request);
  }
}

bool RequestDecoder::helloArgument(std::size_t index, Request& request) {
  if (index == 0) return unsignedUpTo(std::numeric_limits<std::uint64_t>::max(), version_);
  if (!decoder_.isMap()) return decoder_.fail("the options are not a map");
  return options(request);
}

bool RequestDecoder::options(Request& request) {
  std::optional<std::size_t> count;
  if (!decoder_.count(count)) return false;
  for (std::size_t i = 0; !count || i < *count; ++i) {
    if (!decoder_.next()) return false;
    if (!count && decoder_.item().kind == Kind::kBreak) break;
    if (!option(request)) return false;
  }
  return true;
}

bool RequestDecoder::option(Request& request) {
  constexpr unsigned kOpenAroundValue = kOpenAroundArguments + 1;
  std::string_view name;
  if (!decoder_.text(name) || !decoder_.next()) return false;
  const bool is_text = decoder_.item().kind == Kind::kText || decoder_.item().kind == Kind::kTextStart;
  if (name != kAcknowledgeOption) return decoder_.skip(kOpenAroundValue);
  // Options that are not understood are ignored, and so are their values.
  request.durable = false;
  if (!is_text) return decoder_.skip(kOpenAroundValue);
  std::string_view value;
  if (!decoder_.text(value)) return false;
  request.durable = value == kAcknowledgeDurable;
  return true;
}

bool RequestDecoder::reporterIDs(Request& request) {
  if (!decoder_.isArray()) return decoder_.fail("the reporter IDs are neither an array nor null");
  std::optional<std::size_t> count;
  if (!decoder_.count(count)) return false;
  for (std::size_t i = 0; !count || i < *count; ++i) {
    if (!decoder_.next()) return false;
    if (!count && decoder_.item().kind == Kind::kBreak) break;
    if (!reporterID(request.reporter_ids.emplace_back())) return false;
  }
  return true;
}

bool RequestDecoder::reporterID(ReporterID& out) {
  const std::optional<std::int64_t> number = decoder_.signedInteger();
  if (!number) return decoder_.fail("a reporter ID is a signed 64-bit integer");
  out = *number;
  return true;
}

bool RequestDecoder::unsignedUpTo(std::uint64_t most, std::uint64_t& out) {
  if (decoder_.item().kind != Kind::kUnsigned) return decoder_.fail("not an unsigned integer");
  if (decoder_.item().number > most) return decoder_.fail("integer out of range");
  out = decoder_.item().number;
  return true;
}

bool RequestDecoder::atEnd() {
  return decoder_.reader().rest().empty() || decoder_.fail("bytes behind the request");
}

}  // namespace tal
