#include "wire/ShapeCache.h"

#include "wire/CborWriter.h"

namespace tal {

std::string_view ShapeCache::Entry::encodedBefore(std::size_t index) const {
  return std::string_view(encoded).substr(0, index == 0 ? 0 : ends[index - 1]);
}

std::string_view ShapeCache::Entry::encodedKey(std::size_t index) const {
  const std::size_t begin = index == 0 ? 0 : ends[index - 1];
  return {encoded.data() + begin, ends[index] - begin};
}

ShapeCache::Follower::Follower(ShapeCache& cache, std::size_t key_count)
    : cache_(cache), key_count_(key_count), previous_(cache.last_), current_(kNone) {
  const std::size_t expected = previous_ == kNone ? kNone : cache.entries_[previous_].next;
  if (expected != kNone) switchTo(expected);
}

ShapeCache::Follower::~Follower() {
  if (current_ != kNone) --cache_.entries_[current_].followers;
}

bool ShapeCache::Follower::switchTo(std::size_t candidate) {
  if (cache_.entries_[candidate].ends.size() != key_count_) return false;
  if (current_ != kNone) --cache_.entries_[current_].followers;
  current_ = candidate;
  Entry& entry = cache_.entries_[current_];
  ++entry.followers;
  encoded_ = entry.encoded.data();
  ends_ = entry.ends.data();
  // Only a hint: what it says is compared before it is believed.
  if (previous_ != kNone) cache_.entries_[previous_].next = candidate;
  cache_.last_ = candidate;
  return true;
}

std::size_t ShapeCache::Follower::matchAnother(std::string_view bytes) {
  // Another shape may have begun with the same keys. Texts bear their length in
  // front, so equal bytes are equal keys.
  const std::string_view before =
      current_ == kNone ? std::string_view{} : cache_.entries_[current_].encodedBefore(matched_);
  for (std::size_t i = 0; i < cache_.entries_.size(); ++i) {
    const Entry& entry = cache_.entries_[i];
    if (i == current_ || entry.ends.size() != key_count_) continue;
    const std::string_view key = entry.encodedKey(matched_);
    if (!bytes.starts_with(key) || entry.encodedBefore(matched_) != before) continue;
    switchTo(i);
    ++matched_;
    return key.size();
  }
  return 0;
}

std::string_view ShapeCache::Follower::keyAt(std::size_t index) const {
  return cache_.entries_[current_].shape->keyAt(index).text;
}

const DictShape::Pointer& ShapeCache::Follower::shape() const { return cache_.entries_[current_].shape; }

DictShape::Pointer ShapeCache::find(std::span<const std::string_view> keys) const {
  for (const Entry& entry : entries_) {
    if (entry.ends.size() != keys.size()) continue;
    std::size_t equal = 0;
    while (equal < keys.size() && entry.shape->keyAt(equal).text == keys[equal]) ++equal;
    if (equal == keys.size()) return entry.shape;
  }
  return {};
}

std::size_t ShapeCache::oldestUnfollowed() {
  if (entries_.size() < kMostShapes) {
    // Once and for all: followers point into the entries.
    if (entries_.empty()) entries_.reserve(kMostShapes);
    entries_.emplace_back();
    return entries_.size() - 1;
  }
  while (entries_[oldest_].followers != 0) oldest_ = (oldest_ + 1) % kMostShapes;
  const std::size_t index = oldest_;
  oldest_ = (oldest_ + 1) % kMostShapes;
  return index;
}

void ShapeCache::remember(const DictShape::Pointer& shape) {
  if (shape->size() > kMostKeys) return;
  Entry entry;
  CborWriter writer(entry.encoded);
  for (std::size_t i = 0; i < shape->size(); ++i) {
    writer.text(shape->keyAt(i).text);
    if (entry.encoded.size() > kMostKeyBytes) return;
    entry.ends.push_back(static_cast<std::uint32_t>(entry.encoded.size()));
  }
  entry.shape = shape;
  const std::size_t index = oldestUnfollowed();
  entries_[index] = std::move(entry);
  if (last_ != kNone) entries_[last_].next = index;
  last_ = index;
}

}  // namespace tal
