#pragma once

// The keys of a dictionary, apart from its values. Clients send the same keys in
// message after message, so messages share one shape: a dictionary is then one
// pointer and its values, two dictionaries with one shape compare value by
// value, and a key that intake adds to each message leads from one shared shape
// to the next.

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "core/MessageKey.h"
#include "core/SharedPointer.h"

namespace tal {

/// An ordered set of keys. Immutable while shared, and then safe on any thread;
/// its one owner may append.
class DictShape : public SharedNode {
 public:
  using Pointer = SharedPointer<DictShape>;
  static constexpr std::size_t kNotFound = static_cast<std::size_t>(-1);

  static Pointer make() { return Pointer::adopt(new DictShape); }
  static void destroy(const DictShape* shape) { delete shape; }

  /// `keys` must be distinct.
  static Pointer make(std::span<const MessageKey> keys);

  /// The shape that follows `shape` when `key`, which it lacks, is appended.
  /// Appends in place when the caller is the only owner; otherwise the result is
  /// shared with whoever appended the same key to the same shape before.
  static Pointer append(Pointer shape, const MessageKey& key);

  /// A new shape without the key at `index`.
  Pointer without(std::size_t index) const;

  /// The key's position or kNotFound.
  std::size_t find(const MessageKey& key) const;

  std::size_t size() const { return keys_.size(); }
  MessageKey keyAt(std::size_t index) const { return MessageKey(keys_[index], hashes_[index]); }

  /// True when a key contains a blank.
  bool hasBlanks() const { return has_blanks_; }

  /// Memory held, in bytes, answered to the first caller only and 0 after that,
  /// so that a shape shared by a million messages is counted once.
  std::size_t takeFootprintBytes() const;

 private:
  struct Index;

  DictShape();
  ~DictShape();

  void appendInPlace(const MessageKey& key);
  Pointer clone() const;

  std::vector<std::uint32_t> hashes_;
  std::vector<std::string> keys_;
  std::unique_ptr<Index> index_;  // only above kLinearSearchLimit keys
  bool has_blanks_ = false;
  mutable std::atomic<bool> footprint_taken_{false};
  // Set once, by the first append to the shared shape; owned.
  mutable std::atomic<DictShape*> successor_{nullptr};
};

}  // namespace tal
