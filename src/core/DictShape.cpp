#include "core/DictShape.h"

#include <functional>
#include <random>
#include <unordered_map>

namespace tal {

namespace {

// Up to here a scan over the hashes beats any index.
constexpr std::size_t kLinearSearchLimit = 24;

// Longer chains of successors would let a dictionary that is built key by key
// leave a shape behind for each of its keys.
constexpr std::size_t kSharedSuccessorLimit = 32;

// Clients choose keys: without a secret in the hash, a thousand colliding keys
// would turn each look-up into a walk over all of them.
class SeededHash {
 public:
  using is_transparent = void;
  std::size_t operator()(std::string_view text) const {
    std::uint64_t hash = seed();
    for (const char character : text) {
      hash = (hash ^ static_cast<unsigned char>(character)) * 0x9FB21C651E98DF25ULL;
      hash ^= hash >> 29;
    }
    return hash;
  }

 private:
  // One secret a process: to ask for one costs more than a small session's whole life.
  static std::uint64_t seed() {
    static const std::uint64_t kSeed = [] {
      std::random_device device;
      return (std::uint64_t{device()} << 32) | device();
    }();
    return kSeed;
  }
};

}  // namespace

struct DictShape::Index {
  // Keyed by copies: `keys_` moves its strings when it grows.
  std::unordered_map<std::string, std::size_t, SeededHash, std::equal_to<>> positions;
};

DictShape::DictShape() = default;

DictShape::~DictShape() {
  if (DictShape* successor = successor_.load(std::memory_order_acquire); successor && successor->release()) {
    destroy(successor);
  }
}

DictShape::Pointer DictShape::make(std::span<const MessageKey> keys) {
  Pointer shape = make();
  shape->hashes_.reserve(keys.size());
  shape->keys_.reserve(keys.size());
  for (const MessageKey& key : keys) shape->appendInPlace(key);
  return shape;
}

DictShape::Pointer DictShape::clone() const {
  Pointer copy = make();
  copy->hashes_.reserve(hashes_.size() + 1);
  copy->keys_.reserve(keys_.size() + 1);
  copy->hashes_ = hashes_;
  copy->keys_ = keys_;
  copy->has_blanks_ = has_blanks_;
  if (index_) copy->index_ = std::make_unique<Index>(*index_);
  return copy;
}

DictShape::Pointer DictShape::append(Pointer shape, const MessageKey& key) {
  if (shape->isUnique() && !shape->successor_.load(std::memory_order_relaxed)) {
    shape->appendInPlace(key);
    return shape;
  }
  DictShape* successor = shape->successor_.load(std::memory_order_acquire);
  if (successor && successor->keyAt(shape->size()) == key) return Pointer::share(successor);

  Pointer next = shape->clone();
  next->appendInPlace(key);
  if (!successor && next->size() <= kSharedSuccessorLimit) {
    DictShape* expected = nullptr;
    next->retain();
    if (!shape->successor_.compare_exchange_strong(expected, next.get(), std::memory_order_acq_rel)) {
      static_cast<void>(next->release());
    }
  }
  return next;
}

DictShape::Pointer DictShape::without(std::size_t index) const {
  Pointer shape = make();
  for (std::size_t i = 0; i < keys_.size(); ++i) {
    if (i != index) shape->appendInPlace(keyAt(i));
  }
  return shape;
}

void DictShape::appendInPlace(const MessageKey& key) {
  hashes_.push_back(key.hash);
  keys_.emplace_back(key.text);
  has_blanks_ = has_blanks_ || key.text.find(' ') != std::string_view::npos;
  if (index_) {
    index_->positions.emplace(key.text, keys_.size() - 1);
  } else if (keys_.size() > kLinearSearchLimit) {
    index_ = std::make_unique<Index>();
    for (std::size_t i = 0; i < keys_.size(); ++i) index_->positions.emplace(keys_[i], i);
  }
}

std::size_t DictShape::find(const MessageKey& key) const {
  if (index_) {
    const auto found = index_->positions.find(key.text);
    return found == index_->positions.end() ? kNotFound : found->second;
  }
  for (std::size_t i = 0; i < hashes_.size(); ++i) {
    if (hashes_[i] == key.hash && keys_[i] == key.text) return i;
  }
  return kNotFound;
}

std::size_t DictShape::takeFootprintBytes() const {
  if (footprint_taken_.exchange(true, std::memory_order_relaxed)) return 0;
  constexpr std::size_t kIndexBytesPerKey = 64;
  std::size_t bytes = sizeof(DictShape);
  for (const std::string& key : keys_) {
    bytes += sizeof(std::string) + sizeof(std::uint32_t) + key.size();
    if (index_) bytes += kIndexBytesPerKey + key.size();
  }
  return bytes;
}

}  // namespace tal
