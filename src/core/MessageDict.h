#pragma once

// The payload of every message, configuration and derived event: a dictionary
// that keeps the order of insertion, made for 5 to 20 keys that recur in every
// message. One pointer to a block of values beside a shared shape (the keys).

#include <cstddef>
#include <initializer_list>
#include <iterator>
#include <span>
#include <string>
#include <string_view>
#include <utility>

#include "core/DictShape.h"
#include "core/MessageKey.h"
#include "core/MessageValue.h"

namespace tal {

/// A dictionary with text keys.
///
/// Copies are cheap and independent: the copy shares the block of values until
/// one side changes. Nested arrays and dictionaries stay shared by reference
/// (see MessageValue). One dictionary belongs to one thread at a time; copies of
/// it may live on different threads as long as nested containers are not changed.
class MessageDict {
 public:
  using Entry = std::pair<std::string_view, const MessageValue&>;

  MessageDict() = default;
  MessageDict(std::initializer_list<std::pair<MessageKey, MessageValue>> entries);

  /// For decoders: the values, in the order of the shape's keys, are moved out
  /// of `values`. `shape->size() == values.size()`.
  MessageDict(DictShape::Pointer shape, std::span<MessageValue> values);

  std::size_t size() const { return block_ ? block_->count : 0; }
  bool empty() const { return size() == 0; }

  /// The value under the key or null. Valid until the dictionary changes.
  const MessageValue* find(const MessageKey& key) const;
  bool contains(const MessageKey& key) const { return find(key) != nullptr; }

  /// Stores the value, behind the others where the key is new.
  void set(const MessageKey& key, MessageValue value);

  /// True when the key was there.
  bool erase(const MessageKey& key);

  /// Stores every entry of the other dictionary, replacing equal keys.
  void merge(const MessageDict& other);

  MessageKey keyAt(std::size_t index) const { return block_->shape->keyAt(index); }
  const MessageValue& valueAt(std::size_t index) const { return block_->values()[index]; }

  /// True when a key contains a blank.
  bool hasKeyWithBlank() const { return block_ && block_->shape->hasBlanks(); }

  /// A dictionary that shares nothing changeable with this one.
  MessageDict deepCopy() const;

  /// Same keys in any order, equal values.
  friend bool operator==(const MessageDict& a, const MessageDict& b) { return a.equalsIgnoring(b, {}); }

  /// As ==, with the given keys taken out of both sides.
  bool equalsIgnoring(const MessageDict& other, std::span<const MessageKey> ignored) const;

  /// "{key=value, key=value}".
  void appendText(std::string& out) const;
  std::string text() const;

  /// Memory held, nested values included; a shape that others share too is
  /// counted for the first that asks.
  std::size_t footprintBytes() const;

  class Iterator {
   public:
    using value_type = Entry;
    using difference_type = std::ptrdiff_t;

    Iterator(const MessageDict* dict, std::size_t index) : dict_(dict), index_(index) {}
    Entry operator*() const { return {dict_->keyAt(index_).text, dict_->valueAt(index_)}; }
    Iterator& operator++() {
      ++index_;
      return *this;
    }
    bool operator==(const Iterator& other) const { return index_ == other.index_; }

   private:
    const MessageDict* dict_;
    std::size_t index_;
  };
  Iterator begin() const { return {this, 0}; }
  Iterator end() const { return {this, size()}; }

 private:
  // The values follow the block in the same allocation.
  struct Block : SharedNode {
    static void destroy(const Block* block);
    MessageValue* values() { return reinterpret_cast<MessageValue*>(this + 1); }
    const MessageValue* values() const { return reinterpret_cast<const MessageValue*>(this + 1); }

    std::uint32_t count = 0;
    std::uint32_t capacity = 0;
    DictShape::Pointer shape;
  };
  using BlockPointer = SharedPointer<Block>;

  static BlockPointer allocate(std::size_t capacity, DictShape::Pointer shape);
  static BlockPointer copyOf(const Block& block, std::size_t capacity);
  void makeUnique(std::size_t capacity);
  void append(const MessageKey& key, MessageValue value);
  bool valuesEqualInOrder(const MessageDict& other, std::span<const MessageKey> ignored) const;

  BlockPointer block_;
};

}  // namespace tal
