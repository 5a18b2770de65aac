#include "core/MessageDict.h"

#include <algorithm>
#include <array>
#include <memory>
#include <new>

namespace tal {

namespace {

// Intake adds up to this many keys to what a client sent: room for them at once
// saves a second allocation for every message.
constexpr std::size_t kSpareValues = 4;

std::size_t grownCapacity(std::size_t needed) { return std::max(needed + kSpareValues, needed + needed / 2); }

bool isAmong(const MessageKey& key, std::span<const MessageKey> keys) {
  return std::find(keys.begin(), keys.end(), key) != keys.end();
}

}  // namespace

void MessageDict::Block::destroy(const Block* block) {
  auto* owned = const_cast<Block*>(block);
  std::destroy_n(owned->values(), owned->count);
  owned->~Block();
  ::operator delete(owned);
}

MessageDict::BlockPointer MessageDict::allocate(std::size_t capacity, DictShape::Pointer shape) {
  static_assert(sizeof(Block) % alignof(MessageValue) == 0);
  void* memory = ::operator new(sizeof(Block) + capacity * sizeof(MessageValue));
  auto* block = new (memory) Block;
  block->capacity = static_cast<std::uint32_t>(capacity);
  block->shape = std::move(shape);
  return BlockPointer::adopt(block);
}

MessageDict::BlockPointer MessageDict::copyOf(const Block& block, std::size_t capacity) {
  BlockPointer copy = allocate(capacity, block.shape);
  std::uninitialized_copy_n(block.values(), block.count, copy->values());
  copy->count = block.count;
  return copy;
}

MessageDict::MessageDict(std::initializer_list<std::pair<MessageKey, MessageValue>> entries) {
  for (const auto& [key, value] : entries) set(key, value);
}

MessageDict::MessageDict(DictShape::Pointer shape, std::span<MessageValue> values) {
  block_ = allocate(values.size() + kSpareValues, std::move(shape));
  std::uninitialized_move_n(values.begin(), values.size(), block_->values());
  block_->count = static_cast<std::uint32_t>(values.size());
}

const MessageValue* MessageDict::find(const MessageKey& key) const {
  if (!block_) return nullptr;
  const std::size_t index = block_->shape->find(key);
  return index == DictShape::kNotFound ? nullptr : block_->values() + index;
}

void MessageDict::makeUnique(std::size_t capacity) {
  if (!block_) {
    block_ = allocate(grownCapacity(capacity), DictShape::make());
  } else if (!block_->isUnique()) {
    block_ = copyOf(*block_, std::max<std::size_t>(capacity, block_->capacity));
  } else if (block_->capacity < capacity) {
    BlockPointer grown = allocate(grownCapacity(capacity), std::move(block_->shape));
    std::uninitialized_move_n(block_->values(), block_->count, grown->values());
    grown->count = block_->count;
    block_ = std::move(grown);
  }
}

void MessageDict::append(const MessageKey& key, MessageValue value) {
  makeUnique(size() + 1);
  block_->shape = DictShape::append(std::move(block_->shape), key);
  new (block_->values() + block_->count) MessageValue(std::move(value));
  ++block_->count;
}

void MessageDict::set(const MessageKey& key, MessageValue value) {
  const std::size_t index = block_ ? block_->shape->find(key) : DictShape::kNotFound;
  if (index == DictShape::kNotFound) {
    append(key, std::move(value));
  } else {
    makeUnique(size());
    block_->values()[index] = std::move(value);
  }
}

bool MessageDict::erase(const MessageKey& key) {
  const std::size_t index = block_ ? block_->shape->find(key) : DictShape::kNotFound;
  if (index == DictShape::kNotFound) return false;
  makeUnique(size());
  MessageValue* values = block_->values();
  std::move(values + index + 1, values + block_->count, values + index);
  std::destroy_at(values + block_->count - 1);
  --block_->count;
  block_->shape = block_->shape->without(index);
  return true;
}

void MessageDict::merge(const MessageDict& other) {
  if (other.empty()) return;
  // With the same keys nothing of this dictionary remains.
  if (!block_ || block_->shape.get() == other.block_->shape.get()) {
    block_ = other.block_;
    return;
  }
  const BlockPointer source = other.block_;  // holds it even if `other` is this
  makeUnique(size());
  std::size_t guess = 0;
  for (std::size_t i = 0; i < source->count; ++i) {
    const MessageKey key = source->shape->keyAt(i);
    // Keys mostly stand in the same order on both sides.
    const bool guessed = guess < block_->count && block_->shape->keyAt(guess) == key;
    const std::size_t index = guessed ? guess : block_->shape->find(key);
    if (index == DictShape::kNotFound) {
      append(key, source->values()[i]);
    } else {
      block_->values()[index] = source->values()[i];
      guess = index + 1;
    }
  }
}

MessageDict MessageDict::deepCopy() const {
  const auto isContainer = [](const MessageValue& value) {
    return value.kind() == MessageValue::Kind::kArray || value.kind() == MessageValue::Kind::kDict;
  };
  // Without containers there is nothing that a change could show through.
  if (!block_ || std::none_of(block_->values(), block_->values() + block_->count, isContainer)) return *this;
  MessageDict copy;
  copy.block_ = allocate(block_->count + kSpareValues, block_->shape);
  for (std::size_t i = 0; i < block_->count; ++i) {
    new (copy.block_->values() + i) MessageValue(block_->values()[i].deepCopy());
    ++copy.block_->count;
  }
  return copy;
}

bool MessageDict::valuesEqualInOrder(const MessageDict& other, std::span<const MessageKey> ignored) const {
  constexpr std::size_t kFewIgnored = 4;
  std::array<std::size_t, kFewIgnored> skipped{};
  std::size_t skipped_count = 0;
  for (const MessageKey& key : ignored) skipped[skipped_count++] = block_->shape->find(key);
  for (std::size_t i = 0; i < block_->count; ++i) {
    if (block_->values()[i] == other.block_->values()[i]) continue;
    const auto end = skipped.begin() + static_cast<std::ptrdiff_t>(skipped_count);
    if (std::find(skipped.begin(), end, i) == end) return false;
  }
  return true;
}

bool MessageDict::equalsIgnoring(const MessageDict& other, std::span<const MessageKey> ignored) const {
  constexpr std::size_t kFewIgnored = 4;
  if (block_ && other.block_ && block_->shape.get() == other.block_->shape.get() &&
      ignored.size() <= kFewIgnored) {
    return valuesEqualInOrder(other, ignored);
  }
  std::size_t compared = 0;
  for (std::size_t i = 0; i < size(); ++i) {
    const MessageKey key = keyAt(i);
    if (isAmong(key, ignored)) continue;
    const MessageValue* counterpart = other.find(key);
    if (!counterpart || !(*counterpart == valueAt(i))) return false;
    ++compared;
  }
  std::size_t expected = other.size();
  for (const MessageKey& key : ignored) expected -= other.contains(key) ? 1 : 0;
  return compared == expected;
}

void MessageDict::appendText(std::string& out) const {
  out += '{';
  for (std::size_t i = 0; i < size(); ++i) {
    if (i != 0) out += ", ";
    out += keyAt(i).text;
    out += '=';
    valueAt(i).appendText(out);
  }
  out += '}';
}

std::string MessageDict::text() const {
  std::string out;
  appendText(out);
  return out;
}

std::size_t MessageDict::footprintBytes() const {
  if (!block_) return 0;
  std::size_t bytes = sizeof(Block) + block_->capacity * sizeof(MessageValue);
  bytes += block_->shape->takeFootprintBytes();
  for (std::size_t i = 0; i < block_->count; ++i) bytes += block_->values()[i].footprintBytes();
  return bytes;
}

}  // namespace tal
