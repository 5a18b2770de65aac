#include "wire/ReplyEncoder.h"

#include "wire/CborWriter.h"

namespace tal {

namespace {

constexpr std::size_t kItemsOfReply = 3;
constexpr std::uint64_t kSucceeded = 0;
constexpr std::uint64_t kFailed = 1;

}  // namespace

template <typename Write>
void ReplyEncoder::success(std::uint64_t call, const Write& write) {
  CborWriter writer(out_);
  const std::size_t frame = writer.beginFrame();
  writer.array(kItemsOfReply);
  writer.unsignedInteger(call);
  writer.unsignedInteger(kSucceeded);
  write(writer);
  writer.endFrame(frame);
}

void ReplyEncoder::null(std::uint64_t call) {
  success(call, [](CborWriter& writer) { writer.null(); });
}

void ReplyEncoder::boolean(std::uint64_t call, bool result) {
  success(call, [result](CborWriter& writer) { writer.boolean(result); });
}

void ReplyEncoder::serviceType(std::uint64_t call, AudioServiceType result) {
  success(call, [result](CborWriter& writer) { writer.unsignedInteger(static_cast<std::uint16_t>(result)); });
}

void ReplyEncoder::dict(std::uint64_t call, const MessageDict& result) {
  success(call, [&result](CborWriter& writer) { writer.dict(result); });
}

void ReplyEncoder::reporterIDs(std::uint64_t call, std::span<const ReporterID> result) {
  success(call, [result](CborWriter& writer) {
    writer.array(result.size());
    for (const ReporterID id : result) writer.signedInteger(id);
  });
}

void ReplyEncoder::hello(std::uint64_t call, std::string_view server) {
  success(call, [server](CborWriter& writer) {
    writer.map(2);
    writer.text("version");
    writer.unsignedInteger(kProtocolVersion);
    writer.text("server");
    writer.text(server);
  });
}

void ReplyEncoder::failure(std::uint64_t call, std::string_view domain, std::uint64_t code,
                           std::string_view message) {
  CborWriter writer(out_);
  const std::size_t frame = writer.beginFrame();
  writer.array(kItemsOfReply);
  writer.unsignedInteger(call);
  writer.unsignedInteger(kFailed);
  writer.map(3);
  writer.text("domain");
  writer.text(domain);
  writer.text("code");
  writer.unsignedInteger(code);
  writer.text("message");
  writer.text(message);
  writer.endFrame(frame);
}

void ReplyEncoder::error(std::uint64_t call, WireErrorCode code, std::string_view message) {
  failure(call, kWireErrorDomain, static_cast<std::uint64_t>(code), message);
}

void ReplyEncoder::reportingDisabled(std::uint64_t call) {
  failure(call, kServiceErrorDomain, kServiceErrorReportingDisabled, "reporting is disabled");
}

}  // namespace tal
