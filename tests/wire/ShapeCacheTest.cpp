#include <gtest/gtest.h>

#include <string>
#include <string_view>
#include <vector>

#include "wire/CborWriter.h"
#include "wire/ShapeCache.h"

namespace tal {
namespace {

using Keys = std::vector<std::string_view>;

DictShape::Pointer shapeOf(const Keys& keys) {
  const std::vector<MessageKey> message_keys(keys.begin(), keys.end());
  return DictShape::make(message_keys);
}

// The shape that following the keys ends at, null where the cache knows none.
const DictShape* follow(ShapeCache& cache, const Keys& keys) {
  ShapeCache::Follower follower(cache, keys.size());
  for (const std::string_view key : keys) {
    std::string encoded;
    CborWriter(encoded).text(key);
    if (follower.match(encoded) != encoded.size()) return nullptr;
  }
  return follower.shape().get();
}

TEST(ShapeCache, FollowsShapesThatPartOnlyAfterSomeKeys) {
  const std::vector<Keys> all = {{"a", "b", "c"}, {"a", "b", "d"}, {"a", "c", "b"}, {"a", "b"}, {"x"}};
  ShapeCache cache;
  std::vector<DictShape::Pointer> shapes;
  for (const Keys& keys : all) cache.remember(shapes.emplace_back(shapeOf(keys)));
  for (const std::size_t i : {0U, 1U, 2U, 3U, 4U, 2U, 1U, 0U, 0U, 3U, 1U, 4U, 4U}) {
    EXPECT_EQ(follow(cache, all[i]), shapes[i].get()) << i;
    EXPECT_EQ(cache.find(all[i]).get(), shapes[i].get()) << i;
  }
  for (const Keys& unknown :
       {Keys{"a", "b", "e"}, Keys{"a"}, Keys{"a", "b", "c", "d"}, Keys{"b", "a", "c"}}) {
    EXPECT_EQ(follow(cache, unknown), nullptr);
    EXPECT_FALSE(cache.find(unknown));
  }
}

TEST(ShapeCache, ForgetsTheOldestButNeverOneThatIsFollowed) {
  ShapeCache cache;
  const DictShape::Pointer followed = shapeOf({"kept"});
  cache.remember(followed);
  std::string encoded;
  CborWriter(encoded).text("kept");
  ShapeCache::Follower follower(cache, 1);
  ASSERT_EQ(follower.match(encoded), encoded.size());

  std::vector<std::string> names;
  for (std::size_t i = 0; i < 3 * ShapeCache::kMostShapes; ++i) names.push_back("key" + std::to_string(i));
  for (const std::string& name : names) cache.remember(shapeOf({name}));

  EXPECT_EQ(follower.shape().get(), followed.get());
  EXPECT_TRUE(cache.find(Keys{"kept"}));
  EXPECT_FALSE(cache.find(Keys{names.front()}));
  std::size_t remembered = 0;
  for (const std::string& name : names) remembered += cache.find(Keys{name}) ? 1 : 0;
  EXPECT_EQ(remembered, ShapeCache::kMostShapes - 1);
}

TEST(ShapeCache, PassesOverShapesThatAreTooLarge) {
  std::vector<std::string> names;
  for (std::size_t i = 0; i <= ShapeCache::kMostKeys; ++i) names.push_back(std::to_string(i));
  const Keys too_many(names.begin(), names.end());
  const Keys most(names.begin(), names.end() - 1);
  const std::string long_name(ShapeCache::kMostKeyBytes, 'x');
  ShapeCache cache;
  for (const Keys& keys : {too_many, most, Keys{long_name}}) cache.remember(shapeOf(keys));
  EXPECT_FALSE(cache.find(too_many));
  EXPECT_TRUE(cache.find(most));
  EXPECT_FALSE(cache.find(Keys{long_name}));
}

}  // namespace
}  // namespace tal
