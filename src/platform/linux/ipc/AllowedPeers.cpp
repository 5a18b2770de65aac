#include "platform/linux/ipc/AllowedPeers.h"

#include <grp.h>
#include <pwd.h>

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <string_view>

#include "platform/linux/ipc/IpcSettings.h"

namespace tal {

namespace {

// Grows the buffer that a look-up of the reentrant kind wants.
template <typename Record, typename LookUp>
const Record* lookUp(Record& record, std::vector<char>& buffer, const LookUp& look_up) {
  constexpr std::size_t kFirstBytes = 1024;
  constexpr std::size_t kMostBytes = std::size_t{1} << 20;
  Record* found = nullptr;
  for (std::size_t bytes = kFirstBytes; bytes <= kMostBytes; bytes *= 4) {
    buffer.resize(bytes);
    if (look_up(&record, buffer.data(), buffer.size(), &found) != ERANGE) break;
  }
  return found;
}

std::optional<std::uint32_t> asNumber(std::string_view text) {
  std::uint32_t number = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
  if (error != std::errc{} || end != text.data() + text.size()) return std::nullopt;
  return number;
}

std::optional<uid_t> userNamed(const std::string& name) {
  passwd record{};
  std::vector<char> buffer;
  const passwd* found =
      lookUp(record, buffer, [&name](auto... arguments) { return ::getpwnam_r(name.c_str(), arguments...); });
  return found ? found->pw_uid : asNumber(name);
}

std::optional<gid_t> groupNamed(const std::string& name) {
  group record{};
  std::vector<char> buffer;
  const group* found =
      lookUp(record, buffer, [&name](auto... arguments) { return ::getgrnam_r(name.c_str(), arguments...); });
  return found ? found->gr_gid : asNumber(name);
}

std::optional<std::vector<std::string>> names(const SettingsStore& settings, std::string_view key) {
  const std::optional<MessageValue> value = settings.value(kIpcSettingsDomain, key);
  if (!value) return std::nullopt;
  std::vector<std::string> all;
  if (const MessageArray* items = value->array()) {
    for (const MessageValue& item : *items) all.push_back(item.text());
  } else {
    all.push_back(value->text());
  }
  return all;
}

}  // namespace

bool AllowedPeers::includes(const PeerCredentials& peer) const {
  if (includesEverybody()) return true;
  const auto is_user = [&peer](const std::string& name) { return userNamed(name) == peer.user; };
  const auto is_group = [&peer](const std::string& name) {
    const std::optional<gid_t> group = groupNamed(name);
    const auto& others = peer.supplementary_groups;
    return group && (*group == peer.group || std::find(others.begin(), others.end(), *group) != others.end());
  };
  return (users && std::any_of(users->begin(), users->end(), is_user)) ||
         (groups && std::any_of(groups->begin(), groups->end(), is_group));
}

AllowedPeers readAllowedPeers(const SettingsStore& settings) {
  return {names(settings, "allowed_users"), names(settings, "allowed_groups")};
}

}  // namespace tal
