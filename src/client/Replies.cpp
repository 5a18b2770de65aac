// Replies of the daemon, decoded.
#include "client/Replies.h"

#include "client/CborReader.h"
#include "client/Errors.h"

namespace tal::clientlib {

namespace {

using Kind = CborToken::Kind;

/// Calls `entry(key, value)` for each entry of a map that `head` began, with the first token of the value.
/// Values that hold more than that are passed over.
template <typename Entry>
bool readMap(CborReader& reader, const CborToken& head, Entry entry) {
  for (std::uint64_t i = 0; head.kind == Kind::OpenMap || i < head.number; ++i) {
    CborToken key;
    CborToken value;
    if (!reader.next(key)) return false;
    if (key.kind == Kind::Break) return head.kind == Kind::OpenMap;
    if (key.kind != Kind::Text) return false;
    CborReader ahead = reader;
    if (!ahead.next(value) || !reader.skip()) return false;
    entry(key.text, value);
  }
  return true;
}

bool readError(CborReader& reader, Reply& reply) {
  CborToken head;
  if (!reader.next(head) || (head.kind != Kind::Map && head.kind != Kind::OpenMap)) return false;
  reply.error = makeError(TAL_REFUSED, 0, "", "");
  return readMap(reader, head, [&](std::string_view key, const CborToken& value) {
    if (key == "domain" && value.kind == Kind::Text) copyText(reply.error.domain, value.text);
    if (key == "message" && value.kind == Kind::Text) copyText(reply.error.message, value.text);
    if (key == "code" && value.isInteger()) reply.error.code = value.asSigned();
  });
}

bool readReporters(CborReader& reader, const CborToken& head, Reply& reply) {
  reply.reporters.clear();
  for (std::uint64_t i = 0; head.kind == Kind::OpenArray || i < head.number; ++i) {
    CborToken item;
    if (!reader.next(item)) return false;
    if (item.kind == Kind::Break) return head.kind == Kind::OpenArray;
    if (!item.isInteger()) return false;
    reply.reporters.push_back(item.asSigned());
  }
  return true;
}

bool readResult(CborReader& reader, Reply& reply) {
  CborToken token;
  if (!reader.next(token)) return false;
  switch (token.kind) {
    case Kind::Null:
      reply.result = Reply::Result::Null;
      return true;
    case Kind::Bool:
    case Kind::Unsigned:
      reply.result = Reply::Result::Number;
      reply.number = token.number;
      return true;
    case Kind::Array:
    case Kind::OpenArray:
      reply.result = Reply::Result::Reporters;
      return readReporters(reader, token, reply);
    case Kind::Map:
    case Kind::OpenMap:
      reply.result = Reply::Result::Map;
      return readMap(reader, token, [&](std::string_view key, const CborToken& value) {
        if (key == "reporterID" && value.isInteger()) reply.reporterId = value.asSigned();
        if (key == "serviceType" && value.kind == Kind::Unsigned) reply.serviceType = value.number;
        if (key == "version" && value.kind == Kind::Unsigned) reply.version = value.number;
        if (key == "server" && value.kind == Kind::Text) reply.server = value.text;
      });
    default:
      return false;
  }
}

}  // namespace

bool decodeReply(std::span<const unsigned char> frame, Reply& reply) {
  CborReader reader(frame);
  CborToken head;
  CborToken call;
  CborToken status;
  if (!reader.next(head) || head.kind != Kind::Array || head.number != 3) return false;
  if (!reader.next(call) || call.kind != Kind::Unsigned) return false;
  if (!reader.next(status) || status.kind != Kind::Unsigned || status.number > 1) return false;
  reply.call = call.number;
  reply.failed = status.number == 1;
  reply.reporterId = 0;
  reply.serviceType = TAL_SERVICE_UNKNOWN;
  const bool read = reply.failed ? readError(reader, reply) : readResult(reader, reply);
  return read && reader.atEnd();
}

}  // namespace tal::clientlib
