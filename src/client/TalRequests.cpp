// The C interface to requests: checks arguments, lays them out in CBOR and queues them.
#include <sys/random.h>

#include <array>
#include <bit>
#include <memory>
#include <new>
#include <span>

#include "client/Outbox.h"
#include "client/Requests.h"
#include "client/TalConnection.h"
#include "client/TalMessage.h"
#include "client/talreporting.h"

using namespace tal::clientlib;

namespace {

tal_status sessionRequest(tal_connection* connection, tal_operation operation, std::int64_t reporter) {
  if (!connection || reporter == 0) return TAL_INVALID;
  SmallCbor<16> id;
  const RecordParts request{operation, {reporter, 0}, {id.integer(reporter).bytes(), {}, {}}};
  return connection->outbox.request({&request, 1});
}

/// A message's map: its head, which is written to `head`, and its entries.
std::span<const unsigned char> mapHead(const tal_message& message, CborWriter& head) {
  return head.map(message.entries).bytes();
}

std::span<const unsigned char> entries(const tal_message& message) { return {message.data, message.size}; }

struct Addressed {
  const tal_message& message;
  std::uint32_t category;
  std::uint16_t type;
  std::span<const std::int64_t> reporters;
  std::uint64_t tag;
};

tal_status send(Outbox& outbox, const Addressed& what, CborWriter& rest) {
  SmallCbor<16> head;
  rest.number(what.category).number(what.type);
  if (what.reporters.empty()) {
    rest.null();
  } else {
    rest.array(what.reporters.size());
    for (const std::int64_t reporter : what.reporters) rest.integer(reporter);
  }
  const std::int64_t reporter = what.reporters.size() == 1 ? what.reporters[0] : 0;
  return outbox.send({TAL_SEND_MESSAGE,
                      {reporter, what.tag},
                      {mapHead(what.message, head), entries(what.message), rest.bytes()}});
}

/// Apart from each other, so that an audio thread's stack is not stretched by what the rare case needs.
constexpr std::size_t kFewReporters = 8;

tal_status sendToFew(Outbox& outbox, const Addressed& what) {
  SmallCbor<16 + kHeadBytes*(kFewReporters + 1)> rest;
  return send(outbox, what, rest);
}

[[gnu::noinline]] tal_status sendToMany(Outbox& outbox, const Addressed& what) {
  SmallCbor<16 + kHeadBytes*(TAL_MAX_REPORTERS + 1)> rest;
  return send(outbox, what, rest);
}

tal_status lookUp(tal_connection* connection, tal_operation operation, std::int64_t reporter,
                  std::span<const unsigned char> arguments, tal_reply_function function, void* user) try {
  if (!connection || !function) return TAL_INVALID;
  auto owner = std::make_unique<LookUp>(LookUp{function, user});
  const RecordParts request{
      operation, {reporter, std::bit_cast<std::uint64_t>(owner.get())}, {arguments, {}, {}}};
  const tal_status status = connection->outbox.request({&request, 1});
  // The record owns it now.
  if (status == TAL_OK) static_cast<void>(owner.release());
  return status;
} catch (const std::bad_alloc&) {
  return TAL_OUT_OF_MEMORY;
}

}  // namespace

extern "C" {

int64_t tal_make_reporter_id(void) noexcept {
  std::uint64_t random = 0;
  // The small numbers are left to people; the daemon itself uses 1.
  constexpr std::uint64_t kReserved = 1024;
  do {
    if (getrandom(&random, sizeof random, 0) != static_cast<ssize_t>(sizeof random)) continue;
    random >>= 1;
  } while (random < kReserved);
  return static_cast<std::int64_t>(random);
}

tal_status tal_session_create(tal_connection* connection, int64_t reporter_id) noexcept {
  return sessionRequest(connection, TAL_CREATE_SESSION, reporter_id);
}

tal_status tal_session_set_service_type(tal_connection* connection, int64_t reporter_id,
                                        uint16_t service_type) noexcept {
  if (!connection || reporter_id == 0) return TAL_INVALID;
  SmallCbor<24> arguments;
  const RecordParts request{TAL_SET_SERVICE_TYPE,
                            {reporter_id, service_type},
                            {arguments.number(service_type).integer(reporter_id).bytes(), {}, {}}};
  return connection->outbox.request({&request, 1});
}

tal_status tal_session_set_configuration(tal_connection* connection, int64_t reporter_id,
                                         const tal_message* configuration) noexcept {
  if (!connection || reporter_id == 0) return TAL_INVALID;
  SmallCbor<16> id;
  SmallCbor<16> head;
  RecordParts request{TAL_SET_CONFIGURATION, {reporter_id, 0}, {}};
  if (configuration) {
    if (const tal_status status = configuration->sendable(); status != TAL_OK) return status;
    request.arguments[0] = mapHead(*configuration, head);
    request.arguments[1] = entries(*configuration);
  } else {
    request.arguments[0] = head.null().bytes();
  }
  request.arguments[2] = id.integer(reporter_id).bytes();
  return connection->outbox.request({&request, 1});
}

tal_status tal_session_start(tal_connection* connection, int64_t reporter_id) noexcept {
  return sessionRequest(connection, TAL_START_SESSION, reporter_id);
}

tal_status tal_session_stop(tal_connection* connection, int64_t reporter_id) noexcept {
  return sessionRequest(connection, TAL_STOP_SESSION, reporter_id);
}

tal_status tal_session_destroy(tal_connection* connection, int64_t reporter_id) noexcept try {
  if (!connection || reporter_id == 0) return TAL_INVALID;
  return connection->outbox.destroySession(reporter_id);
} catch (const std::bad_alloc&) {
  return TAL_OUT_OF_MEMORY;
}

tal_status tal_session_open(tal_connection* connection, int64_t reporter_id, uint16_t service_type,
                            const tal_message* configuration) noexcept {
  if (!connection || reporter_id == 0) return TAL_INVALID;
  SmallCbor<16> id;
  SmallCbor<24> type;
  SmallCbor<16> head;
  id.integer(reporter_id);
  std::array<RecordParts, 4> requests;
  std::size_t count = 0;
  requests[count++] = {TAL_CREATE_SESSION, {reporter_id, 0}, {id.bytes(), {}, {}}};
  requests[count++] = {TAL_SET_SERVICE_TYPE,
                       {reporter_id, service_type},
                       {type.number(service_type).integer(reporter_id).bytes(), {}, {}}};
  if (configuration) {
    if (const tal_status status = configuration->sendable(); status != TAL_OK) return status;
    requests[count++] = {TAL_SET_CONFIGURATION,
                         {reporter_id, 0},
                         {mapHead(*configuration, head), entries(*configuration), id.bytes()}};
  }
  requests[count++] = {TAL_START_SESSION, {reporter_id, 0}, {id.bytes(), {}, {}}};
  return connection->outbox.request({requests.data(), count});
}

tal_status tal_session_send(tal_connection* connection, int64_t reporter_id, const tal_message* message,
                            uint32_t category, uint16_t type) noexcept {
  if (reporter_id == 0) return connection ? connection->outbox.drop(TAL_INVALID) : TAL_INVALID;
  return tal_send(connection, message, category, type, &reporter_id, 1, 0);
}

tal_status tal_send(tal_connection* connection, const tal_message* message, uint32_t category, uint16_t type,
                    const int64_t* reporter_ids, size_t reporter_count, uint64_t tag) noexcept {
  if (!connection) return TAL_INVALID;
  Outbox& outbox = connection->outbox;
  const tal_status status = message ? message->sendable() : TAL_INVALID;
  if (status != TAL_OK) return outbox.drop(status);
  if (reporter_count > TAL_MAX_REPORTERS || (reporter_count > 0 && !reporter_ids))
    return outbox.drop(TAL_INVALID);

  const Addressed addressed{*message, category, type, {reporter_ids, reporter_count}, tag};
  return reporter_count <= kFewReporters ? sendToFew(outbox, addressed) : sendToMany(outbox, addressed);
}

tal_status tal_look_up_service_type(tal_connection* connection, int64_t reporter_id,
                                    tal_reply_function function, void* user) noexcept {
  SmallCbor<16> id;
  return lookUp(connection, TAL_LOOK_UP_SERVICE_TYPE, reporter_id, id.integer(reporter_id).bytes(), function,
                user);
}

tal_status tal_look_up_reporter(tal_connection* connection, int64_t reporter_id, tal_reply_function function,
                                void* user) noexcept {
  SmallCbor<16> id;
  return lookUp(connection, TAL_LOOK_UP_REPORTER, reporter_id, id.integer(reporter_id).bytes(), function,
                user);
}

tal_status tal_look_up_all_reporters(tal_connection* connection, tal_reply_function function,
                                     void* user) noexcept {
  return lookUp(connection, TAL_LOOK_UP_ALL_REPORTERS, 0, {}, function, user);
}

tal_status tal_kill_service(tal_connection* connection) noexcept {
  if (!connection) return TAL_INVALID;
  const RecordParts request{TAL_KILL_SERVICE, {}, {}};
  return connection->outbox.request({&request, 1});
}

}  // extern "C"
