#include "wire/MessageDecoder.h"

#include <cmath>
#include <iterator>
#include <limits>
#include <span>
#include <utility>

#include "core/Utf8.h"

namespace tal {

namespace {

using Kind = CborItem::Kind;

constexpr std::uint64_t kEpochTag = 1;
constexpr std::uint64_t kLargestSigned = std::numeric_limits<std::int64_t>::max();
// What a connection that once sent a large message may keep of its scratch room.
constexpr std::size_t kMostKeptAllocated = 1024;

constexpr const char* kMalformed = "not well-formed CBOR";
constexpr const char* kTooDeep = "nested deeper than 32";
constexpr const char* kOutOfRange = "integer out of range";

template <typename T>
void clearScratch(std::vector<T>& scratch) {
  scratch.clear();
  if (scratch.capacity() > kMostKeptAllocated) scratch.shrink_to_fit();
}

}  // namespace

void MessageDecoder::begin(std::string_view frame) {
  reader_ = CborReader(frame);
  clearScratch(values_);
  clearScratch(keys_);
  if (!assembled_.empty()) assembled_.clear();
}

bool MessageDecoder::next() { return reader_.next() || fail(kMalformed); }

bool MessageDecoder::isArray() const {
  return item().kind == Kind::kArray || item().kind == Kind::kArrayStart;
}

bool MessageDecoder::isMap() const { return item().kind == Kind::kMap || item().kind == Kind::kMapStart; }

bool MessageDecoder::count(std::optional<std::size_t>& out) {
  out.reset();
  if (item().kind == Kind::kArrayStart || item().kind == Kind::kMapStart) return true;
  // Every item takes a byte at least: a huge number is refused before anything
  // is allocated for it.
  const std::size_t most = reader_.rest().size() / (item().kind == Kind::kMap ? 2 : 1);
  if (item().number > most) return fail(kMalformed);
  out = item().number;
  return true;
}

std::optional<std::int64_t> MessageDecoder::signedInteger() const {
  if (item().number > kLargestSigned) return std::nullopt;
  const auto number = static_cast<std::int64_t>(item().number);
  if (item().kind == Kind::kUnsigned) return number;
  if (item().kind == Kind::kNegative) return -1 - number;
  return std::nullopt;
}

bool MessageDecoder::dict(unsigned open, MessageDict& out) {
  if (!isMap()) return fail("not a map");
  return map(open, out);
}

bool MessageDecoder::text(std::string_view& out) {
  if (item().kind == Kind::kText) {
    out = item().bytes;
    return checkUtf8(out);
  }
  if (item().kind == Kind::kTextStart) return string(Kind::kText, out);
  return fail("not a text");
}

bool MessageDecoder::checkUtf8(std::string_view bytes) {
  return isUtf8(bytes) || fail("text that is not UTF-8");
}

// An indefinite string: definite chunks of the same kind, then a break.
bool MessageDecoder::string(CborItem::Kind chunk, std::string_view& out) {
  std::string& whole = assembled_.emplace_back();
  for (;;) {
    if (!next()) return false;
    if (item().kind == Kind::kBreak) break;
    if (item().kind != chunk) return fail(kMalformed);
    if (chunk == Kind::kText && !checkUtf8(item().bytes)) return false;
    whole += item().bytes;
  }
  out = whole;
  return true;
}

// Pushes the item just read onto `values_`.
bool MessageDecoder::value(unsigned open) {
  switch (item().kind) {
    case Kind::kUnsigned:
      values_.emplace_back(item().number);
      return true;
    case Kind::kFloat:
      values_.emplace_back(item().real);
      return true;
    case Kind::kBoolean:
      values_.emplace_back(item().number != 0);
      return true;
    case Kind::kNegative: {
      const std::optional<std::int64_t> number = signedInteger();
      if (!number) return fail(kOutOfRange);
      values_.emplace_back(*number);
      return true;
    }
    case Kind::kText:
    case Kind::kTextStart: {
      std::string_view characters;
      if (!text(characters)) return false;
      values_.emplace_back(characters);
      return true;
    }
    case Kind::kBytes:
      values_.emplace_back(MessageData{std::string(item().bytes)});
      return true;
    case Kind::kBytesStart: {
      std::string_view bytes;
      if (!string(Kind::kBytes, bytes)) return false;
      values_.emplace_back(MessageData{std::string(bytes)});
      return true;
    }
    case Kind::kArray:
    case Kind::kArrayStart:
      return array(open);
    case Kind::kMap:
    case Kind::kMapStart: {
      MessageDict nested;
      if (!map(open, nested)) return false;
      values_.emplace_back(std::move(nested));
      return true;
    }
    case Kind::kTag:
      return tagged();
    case Kind::kNull:
    case Kind::kUndefined:
      return fail("null or undefined within a message");
    case Kind::kBreak:
      return fail(kMalformed);
  }
  return fail(kMalformed);
}

bool MessageDecoder::tagged() {
  if (item().number != kEpochTag) return fail("a tag other than 1 within a message");
  if (!next()) return false;
  double seconds = 0;
  switch (item().kind) {
    case Kind::kUnsigned:
      seconds = static_cast<double>(item().number);
      break;
    case Kind::kNegative: {
      const std::optional<std::int64_t> number = signedInteger();
      if (!number) return fail(kOutOfRange);
      seconds = static_cast<double>(*number);
      break;
    }
    case Kind::kFloat:
      seconds = item().real;
      break;
    default:
      return fail("a date that is not a number");
  }
  // NaN and the infinities are numbers to a message but no points in time.
  if (!std::isfinite(seconds)) return fail("a date that is not finite");
  values_.emplace_back(MessageDate{seconds});
  return true;
}

bool MessageDecoder::array(unsigned open) {
  if (open >= kMostNested) return fail(kTooDeep);
  std::optional<std::size_t> length;
  if (!count(length)) return false;
  const std::size_t first = values_.size();
  for (std::size_t i = 0; !length || i < *length; ++i) {
    if (!next()) return false;
    if (!length && item().kind == Kind::kBreak) break;
    if (!value(open + 1)) return false;
  }
  const auto begin = values_.begin() + static_cast<std::ptrdiff_t>(first);
  MessageArray items(std::make_move_iterator(begin), std::make_move_iterator(values_.end()));
  values_.resize(first);
  values_.emplace_back(std::move(items));
  return true;
}

bool MessageDecoder::map(unsigned open, MessageDict& out) {
  if (open >= kMostNested) return fail(kTooDeep);
  std::optional<std::size_t> pairs;
  if (!count(pairs)) return false;
  const std::size_t first_key = keys_.size();
  const std::size_t first_value = values_.size();
  if (!pairs || *pairs == 0 || *pairs > ShapeCache::kMostKeys) {
    return mapOfUnknownKeys(open, pairs, first_key, first_value, out);
  }

  ShapeCache::Follower follower(shapes_, *pairs);
  while (follower.matched() < *pairs) {
    const std::size_t key_bytes = follower.match(reader_.rest());
    if (key_bytes == 0) {
      for (std::size_t i = 0; i < follower.matched(); ++i) keys_.push_back(follower.keyAt(i));
      return mapOfUnknownKeys(open, pairs, first_key, first_value, out);
    }
    reader_.skip(key_bytes);
    if (!next() || !value(open + 1)) return false;
  }
  out = MessageDict(follower.shape(), std::span(values_).subspan(first_value));
  values_.resize(first_value);
  return true;
}

bool MessageDecoder::key() {
  if (!next()) return false;
  if (item().kind == Kind::kBreak) return true;
  std::string_view characters;
  if (item().kind != Kind::kText && item().kind != Kind::kTextStart) return fail("a key that is no text");
  if (!text(characters)) return false;
  keys_.push_back(characters);
  return true;
}

bool MessageDecoder::mapOfUnknownKeys(unsigned open, std::optional<std::size_t> pairs, std::size_t first_key,
                                      std::size_t first_value, MessageDict& out) {
  for (;;) {
    const std::size_t key_count = keys_.size() - first_key;
    if (pairs && key_count == *pairs) break;
    if (!key()) return false;
    if (keys_.size() - first_key == key_count) {  // a break
      if (pairs) return fail(kMalformed);
      break;
    }
    if (!next() || !value(open + 1)) return false;
  }
  out = build(first_key, first_value);
  keys_.resize(first_key);
  values_.resize(first_value);
  return true;
}

MessageDict MessageDecoder::build(std::size_t first_key, std::size_t first_value) {
  const auto keys = std::span(std::as_const(keys_)).subspan(first_key);
  const auto values = std::span(values_).subspan(first_value);
  if (keys.empty()) return {};
  if (keys.size() <= ShapeCache::kMostKeys) {
    if (const DictShape::Pointer known = shapes_.find(keys)) return MessageDict(known, values);
  }
  DictShape::Pointer shape = DictShape::make();
  for (std::size_t i = 0; i < keys.size(); ++i) {
    const MessageKey key(keys[i]);
    const std::size_t place = shape->find(key);
    if (place != DictShape::kNotFound) {
      values[place] = std::move(values[i]);  // the last one wins
      continue;
    }
    const std::size_t end = shape->size();
    if (end != i) values[end] = std::move(values[i]);
    shape = DictShape::append(std::move(shape), key);
  }
  if (shape->size() == keys.size()) shapes_.remember(shape);
  return MessageDict(shape, values.first(shape->size()));
}

bool MessageDecoder::skip(unsigned open) {
  std::string_view ignored;
  switch (item().kind) {
    case Kind::kText:
    case Kind::kTextStart:
      return text(ignored);
    case Kind::kBytesStart:
      return string(Kind::kBytes, ignored);
    case Kind::kTag:
      // Tags nest too, and this descends for each.
      if (open >= kMostNested) return fail(kTooDeep);
      return next() && skip(open + 1);
    case Kind::kBreak:
      return fail(kMalformed);
    case Kind::kArray:
    case Kind::kArrayStart:
    case Kind::kMap:
    case Kind::kMapStart:
      break;
    default:
      return true;
  }
  if (open >= kMostNested) return fail(kTooDeep);
  const std::size_t items_per_step = isMap() ? 2 : 1;
  std::optional<std::size_t> steps;
  if (!count(steps)) return false;
  for (std::size_t i = 0; !steps || i < *steps * items_per_step; ++i) {
    if (!next()) return false;
    if (!steps && item().kind == Kind::kBreak && i % items_per_step == 0) break;
    if (!skip(open + 1)) return false;
  }
  return true;
}

}  // namespace tal
