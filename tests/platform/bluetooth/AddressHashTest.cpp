#include <gtest/gtest.h>
#include <sys/stat.h>

#include <string>

#include "platform/TemporaryDirectory.h"
#include "platform/linux/bluetooth/AddressHash.h"

namespace tal {
namespace {

class AddressHashTest : public testing::Test {
 protected:
  std::string hashOf(std::string_view address) {
    std::string error;
    return AddressHash(directory_.path()).of(address, error).value_or("none: " + error);
  }

  test::TemporaryDirectory directory_;
  std::filesystem::path salt_ = directory_.path() / "accessory-salt";
};

TEST_F(AddressHashTest, IsTheKeyedHashUnderTheKeptSalt) {
  test::writeFile(salt_, std::string(32, 'k'));
  // printf %s 38:18:4C:00:00:01 | openssl dgst -sha256 -mac HMAC -macopt key:kkkkkkkkkkkkkkkkkkkkkkkkkkkkkkkk
  EXPECT_EQ(hashOf("38:18:4C:00:00:01"), "98652ddbc0a5eae0fb913714c1115d30228db20ea688e0e109714439cdfad754");
}

TEST_F(AddressHashTest, TheSaltIsMadeOnceForTheOwnerAloneAndDiffersBetweenDevices) {
  const std::string hash = hashOf("38:18:4C:00:00:01");
  struct stat status {};
  ASSERT_EQ(::stat(salt_.c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777U, 0600U);
  EXPECT_EQ(hashOf("38:18:4C:00:00:01"), hash);
  EXPECT_NE(hashOf("38:18:4C:00:00:02"), hash);
  std::filesystem::remove(salt_);
  EXPECT_NE(hashOf("38:18:4C:00:00:01"), hash);
}

TEST_F(AddressHashTest, ADamagedSaltIsNotReplacedAndAnUnwritableOneIsAnError) {
  test::writeFile(salt_, "short");
  EXPECT_TRUE(hashOf("a").starts_with("none: the salt ")) << hashOf("a");
  EXPECT_EQ(test::readFile(salt_), "short");
  std::string error;
  EXPECT_EQ(AddressHash(directory_.path() / "nowhere").of("a", error), std::nullopt);
  EXPECT_NE(error.find("No such file"), std::string::npos) << error;
}

}  // namespace
}  // namespace tal
