// The dictionary that a program builds, encoded while it grows, so that a send has only bytes to copy.
#include "client/TalMessage.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <new>

#include "client/CborEncode.h"
#include "client/Utf8.h"

using namespace tal::clientlib;

namespace {

constexpr std::size_t kDefaultCapacity = 1024;
/// No daemon takes a message of this size; it only keeps a runaway program from filling the memory.
constexpr std::size_t kMaxBytes = std::size_t{64} << 20;
/// Tag of a date that is a number of seconds since 1970.
constexpr std::uint64_t kEpochTag = 1;

}  // namespace

tal_message::tal_message(std::size_t wanted) {
  const std::size_t bytes = std::min(wanted == 0 ? kDefaultCapacity : wanted, kMaxBytes);
  data = static_cast<unsigned char*>(std::malloc(bytes));
  if (!data) throw std::bad_alloc();
  // Touched now, so that an audio thread that fills it takes no page fault.
  std::memset(data, 0, bytes);
  capacity = bytes;
}

tal_message::~tal_message() { std::free(data); }

void tal_message::reset() {
  size = 0;
  entries = 0;
  depth = 0;
  arrays = 0;
  status = TAL_OK;
}

unsigned char* tal_message::begin(const char* key, std::size_t keyBytes, std::size_t valueBytes) {
  if (status != TAL_OK) return nullptr;
  const bool inArray = depth > 0 && (arrays >> (depth - 1) & 1U) != 0;
  if (inArray != (key == nullptr) || (key && !isUtf8(key, keyBytes))) {
    spoil(TAL_INVALID);
    return nullptr;
  }
  if (keyBytes > kMaxBytes || valueBytes > kMaxBytes) {
    spoil(TAL_TOO_LARGE);
    return nullptr;
  }
  const std::size_t needed = keyBytes + valueBytes + 2 * kHeadBytes;
  if (capacity - size < needed && !grow(needed)) return nullptr;
  unsigned char* at = data + size;
  if (key) at = putString(at, CborMajor::Text, key, keyBytes);
  if (depth == 0) ++entries;
  return at;
}

bool tal_message::grow(std::size_t more) {
  if (size + more > kMaxBytes) {
    spoil(TAL_TOO_LARGE);
    return false;
  }
  const std::size_t bytes = std::max(2 * capacity, size + more);
  auto* moved = static_cast<unsigned char*>(std::realloc(data, bytes));
  if (!moved) {
    spoil(TAL_OUT_OF_MEMORY);
    return false;
  }
  data = moved;
  capacity = bytes;
  return true;
}

void tal_message::open(const char* key, std::size_t keyBytes, bool array) {
  // The message itself is the first level.
  if (depth + 1 >= TAL_MAX_NESTING) spoil(status == TAL_OK ? TAL_INVALID : status);
  unsigned char* at = begin(key, keyBytes, 0);
  if (!at) return;
  at = putByte(at, array ? kCborOpenArray : kCborOpenMap);
  const std::uint32_t bit = 1U << depth;
  arrays = array ? arrays | bit : arrays & ~bit;
  ++depth;
  finish(at);
}

void tal_message::close() {
  if (status != TAL_OK) return;
  if (depth == 0) return spoil(TAL_INVALID);
  if (capacity == size && !grow(1)) return;
  data[size++] = kCborBreak;
  --depth;
}

extern "C" {

tal_message* tal_message_new(size_t capacity) noexcept try {
  return new tal_message(capacity);
} catch (const std::bad_alloc&) {
  return nullptr;
}

void tal_message_free(tal_message* message) noexcept { delete message; }

void tal_message_reset(tal_message* message) noexcept {
  if (message) message->reset();
}

tal_status tal_message_status(const tal_message* message) noexcept {
  return message ? message->sendable() : TAL_INVALID;
}

size_t tal_message_bytes(const tal_message* message) noexcept {
  if (!message) return 0;
  unsigned char head[kHeadBytes];
  const auto headBytes = putHead(head, CborMajor::Map, message->entries) - head;
  return static_cast<size_t>(headBytes) + message->size;
}

void tal_message_put_string(tal_message* message, const char* key, size_t key_bytes, const char* value,
                            size_t value_bytes) noexcept {
  if (!message) return;
  if (!value || !isUtf8(value, value_bytes)) {
    if (message->status == TAL_OK) message->spoil(TAL_INVALID);
    return;
  }
  if (unsigned char* at = message->begin(key, key_bytes, value_bytes)) {
    message->finish(putString(at, CborMajor::Text, value, value_bytes));
  }
}

void tal_message_put_int(tal_message* message, const char* key, size_t key_bytes, int64_t value) noexcept {
  if (!message) return;
  if (unsigned char* at = message->begin(key, key_bytes, 0)) {
    message->finish(putInteger(at, value));
  }
}

void tal_message_put_uint(tal_message* message, const char* key, size_t key_bytes, uint64_t value) noexcept {
  if (!message) return;
  if (unsigned char* at = message->begin(key, key_bytes, 0)) {
    message->finish(putHead(at, CborMajor::Unsigned, value));
  }
}

void tal_message_put_double(tal_message* message, const char* key, size_t key_bytes, double value) noexcept {
  if (!message) return;
  if (unsigned char* at = message->begin(key, key_bytes, 0)) {
    message->finish(putDouble(at, value));
  }
}

void tal_message_put_bool(tal_message* message, const char* key, size_t key_bytes, bool value) noexcept {
  if (!message) return;
  if (unsigned char* at = message->begin(key, key_bytes, 0)) {
    message->finish(putByte(at, value ? kCborTrue : kCborFalse));
  }
}

void tal_message_put_date(tal_message* message, const char* key, size_t key_bytes, double seconds) noexcept {
  if (!message) return;
  if (unsigned char* at = message->begin(key, key_bytes, kHeadBytes)) {
    message->finish(putDouble(putHead(at, CborMajor::Tag, kEpochTag), seconds));
  }
}

void tal_message_put_data(tal_message* message, const char* key, size_t key_bytes, const void* value,
                          size_t value_bytes) noexcept {
  if (!message) return;
  if (!value && value_bytes > 0) {
    if (message->status == TAL_OK) message->spoil(TAL_INVALID);
    return;
  }
  if (unsigned char* at = message->begin(key, key_bytes, value_bytes)) {
    message->finish(putString(at, CborMajor::Bytes, value, value_bytes));
  }
}

void tal_message_put_map(tal_message* message, const char* key, size_t key_bytes) noexcept {
  if (message) message->open(key, key_bytes, false);
}

void tal_message_put_array(tal_message* message, const char* key, size_t key_bytes) noexcept {
  if (message) message->open(key, key_bytes, true);
}

void tal_message_end(tal_message* message) noexcept {
  if (message) message->close();
}

}  // extern "C"
