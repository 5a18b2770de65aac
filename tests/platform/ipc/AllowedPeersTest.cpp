#include <gtest/gtest.h>
#include <sys/socket.h>
#include <unistd.h>

#include <optional>

#include "platform/linux/ipc/AllowedPeers.h"
#include "platform/linux/ipc/IpcSettings.h"
#include "support/TestPlatform.h"

namespace tal {
namespace {

using test::FakeSettings;

// The names that every Linux system has.
constexpr const char* kRoot = "root";

TEST(AllowedPeers, NamesUsersAndGroupsByNameAndNumber) {
  const struct {
    const char* name;
    std::optional<MessageValue> users;
    std::optional<MessageValue> groups;
    PeerCredentials peer;
    bool allowed;
  } rows[] = {
      {"no lists", {}, {}, {.user = 4711, .group = 4711}, true},
      {"user by name", MessageArray{"nobody-there", kRoot}, {}, {.user = 0, .group = 4711}, true},
      {"another user", MessageArray{kRoot}, {}, {.user = 4711, .group = 0}, false},
      {"user by number", MessageArray{4711}, {}, {.user = 4711, .group = 1}, true},
      {"user by number as text", MessageArray{"4711"}, {}, {.user = 4711, .group = 1}, true},
      {"no number", MessageArray{"4711x"}, {}, {.user = 4711, .group = 1}, false},
      {"no such name", MessageArray{"nobody-there"}, {}, {.user = static_cast<uid_t>(-1), .group = 1}, false},
      {"empty list", MessageArray{}, {}, {.user = 0, .group = 0}, false},
      {"one name instead of a list", kRoot, {}, {.user = 0, .group = 1}, true},
      {"primary group", {}, MessageArray{kRoot}, {.user = 4711, .group = 0}, true},
      {"supplementary group",
       {},
       MessageArray{kRoot},
       {.user = 4711, .group = 1, .supplementary_groups = {5, 0}},
       true},
      {"another group", {}, MessageArray{kRoot}, {.user = 0, .group = 1, .supplementary_groups = {5}}, false},
      {"group but not user", MessageArray{kRoot}, MessageArray{4711}, {.user = 1, .group = 4711}, true},
      {"neither", MessageArray{kRoot}, MessageArray{4711}, {.user = 1, .group = 1}, false},
  };
  for (const auto& row : rows) {
    FakeSettings settings;
    if (row.users) settings.setValue(kIpcSettingsDomain, "allowed_users", *row.users);
    if (row.groups) settings.setValue(kIpcSettingsDomain, "allowed_groups", *row.groups);
    EXPECT_EQ(readAllowedPeers(settings).includes(row.peer), row.allowed) << row.name;
  }
}

TEST(PeerCredentials, AreThoseOfTheProcessAtTheOtherEnd) {
  int ends[2];
  ASSERT_EQ(::socketpair(AF_UNIX, SOCK_STREAM, 0, ends), 0);
  const PeerCredentials peer = peerCredentials(ends[0]);
  EXPECT_EQ(peer.process_identifier, ::getpid());
  EXPECT_EQ(peer.user, ::geteuid());
  EXPECT_EQ(peer.group, ::getegid());
  EXPECT_EQ(peer.supplementary_groups.size(), static_cast<std::size_t>(::getgroups(0, nullptr)));
  ::close(ends[0]);
  ::close(ends[1]);

  EXPECT_EQ(peerCredentials(-1).user, static_cast<uid_t>(-1)) << "nobody's, where there is no telling";
}

TEST(IpcSettings, TakesOnlyIntegersWithinTheirRange) {
  const struct {
    MessageValue value;
    std::uint32_t max_frame_bytes;
  } rows[] = {
      {1, 1},
      {65536, 65536},
      {2'000'000U, 2'000'000},
      {0, kDefaultMaxFrameBytes},
      {-5, kDefaultMaxFrameBytes},
      {std::int64_t{1} << 40, kDefaultMaxFrameBytes},
      {4096.0, kDefaultMaxFrameBytes},
      {"4096", kDefaultMaxFrameBytes},
  };
  for (const auto& row : rows) {
    FakeSettings settings;
    settings.setValue(kIpcSettingsDomain, "max_frame_bytes", row.value);
    EXPECT_EQ(readIpcSettings(settings).max_frame_bytes, row.max_frame_bytes) << row.value.text();
  }
  FakeSettings settings;
  settings.setValue(kIpcSettingsDomain, "max_kept_mebibytes", 3);
  EXPECT_EQ(readIpcSettings(settings).max_kept_bytes, std::size_t{3} << 20);
}

}  // namespace
}  // namespace tal
