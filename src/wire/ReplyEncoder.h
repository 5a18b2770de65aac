#pragma once

// Encodes replies, frame header included, one behind the other into one buffer
// that goes to the socket as it is.

#include <cstdint>
#include <span>
#include <string>
#include <string_view>

#include "core/EventVocabulary.h"
#include "core/MessageDict.h"
#include "wire/Request.h"
#include "wire/WireProtocol.h"

namespace tal {

/// Borrows the buffer. One thread at a time.
class ReplyEncoder {
 public:
  explicit ReplyEncoder(std::string& out) : out_(out) {}

  void null(std::uint64_t call);
  void boolean(std::uint64_t call, bool result);
  void serviceType(std::uint64_t call, AudioServiceType result);
  void dict(std::uint64_t call, const MessageDict& result);
  void reporterIDs(std::uint64_t call, std::span<const ReporterID> result);
  /// The reply to hello; `server` is the program's name and version.
  void hello(std::uint64_t call, std::string_view server);

  void error(std::uint64_t call, WireErrorCode code, std::string_view message);
  void error(const RequestError& error) { this->error(error.call, error.code, error.message); }
  void reportingDisabled(std::uint64_t call);

 private:
  template <typename Write>
  void success(std::uint64_t call, const Write& write);
  void failure(std::uint64_t call, std::string_view domain, std::uint64_t code, std::string_view message);

  std::string& out_;
};

}  // namespace tal
