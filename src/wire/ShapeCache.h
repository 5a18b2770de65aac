#pragma once

// The shapes of the maps that a connection sent last. A client sends the same
// keys in the same order again and again: while a map is decoded, the bytes of
// each key are compared with those of the shape that is expected, and where all
// agree nothing has to be decoded, hashed or allocated for the keys.

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "core/DictShape.h"

namespace tal {

/// Bounded: the oldest shape makes room. One thread at a time.
class ShapeCache {
 public:
  // Enough for the message kinds of one client; a search looks at all of them.
  static constexpr std::size_t kMostShapes = 64;
  // Larger maps are rare and cost more in their values than in their keys.
  static constexpr std::size_t kMostKeys = 64;
  static constexpr std::size_t kMostKeyBytes = 4096;

  /// Follows one map, key by key, for as long as a known shape agrees with it.
  class Follower {
   public:
    /// A map of `key_count` keys begins. At most kMostShapes / 2 followers live
    /// at a time; each must end before the cache does.
    Follower(ShapeCache& cache, std::size_t key_count);
    Follower(const Follower&) = delete;
    Follower& operator=(const Follower&) = delete;
    ~Follower();

    /// The number of bytes that encode the next key when `bytes` begins with it,
    /// and that key is then passed; 0 when no known shape goes on like this.
    std::size_t match(std::string_view bytes) {
      if (current_ != kNone) {
        const std::size_t begin = matched_ == 0 ? 0 : ends_[matched_ - 1];
        const std::size_t size = ends_[matched_] - begin;
        if (bytes.size() >= size && sameBytes(bytes.data(), encoded_ + begin, size)) {
          ++matched_;
          return size;
        }
      }
      return matchAnother(bytes);
    }

    /// Keys passed so far.
    std::size_t matched() const { return matched_; }
    /// The key passed as number `index`; its text lives while the cache is unchanged.
    std::string_view keyAt(std::size_t index) const;
    /// The shape whose keys have all been passed.
    const DictShape::Pointer& shape() const;

   private:
    std::size_t matchAnother(std::string_view bytes);
    bool switchTo(std::size_t candidate);

    ShapeCache& cache_;
    const std::size_t key_count_;
    const std::size_t previous_;
    std::size_t current_;
    // Of the current entry, which stays where it is as long as it is followed.
    const char* encoded_ = nullptr;
    const std::uint32_t* ends_ = nullptr;
    std::size_t matched_ = 0;
  };

  /// The shape with exactly these keys in this order, or null.
  DictShape::Pointer find(std::span<const std::string_view> keys) const;

  /// Remembers the shape, if it is small enough.
  void remember(const DictShape::Pointer& shape);

 private:
  static constexpr std::size_t kNone = static_cast<std::size_t>(-1);

  // A key is compared here for every key of every message; a call of memcmp
  // would cost more than the comparison.
  static bool sameBytes(const char* a, const char* b, std::size_t size) {
    constexpr std::size_t kWord = sizeof(std::uint64_t);
    const auto word = [](const char* bytes) {
      std::uint64_t value = 0;
      std::memcpy(&value, bytes, sizeof value);
      return value;
    };
    if (size < kWord) return std::memcmp(a, b, size) == 0;
    for (std::size_t at = 0; at + kWord <= size; at += kWord) {
      if (word(a + at) != word(b + at)) return false;
    }
    return word(a + size - kWord) == word(b + size - kWord);
  }

  struct Entry {
    DictShape::Pointer shape;
    // The keys as CBOR, one behind the other, and where each ends.
    std::string encoded;
    std::vector<std::uint32_t> ends;
    // The entry that came after this one the last time.
    std::size_t next = kNone;
    // Followers that rely on this entry staying what it is.
    std::size_t followers = 0;

    std::string_view encodedKey(std::size_t index) const;
    std::string_view encodedBefore(std::size_t index) const;
  };

  std::size_t oldestUnfollowed();

  std::vector<Entry> entries_;
  std::size_t oldest_ = 0;
  std::size_t last_ = kNone;
};

}  // namespace tal
