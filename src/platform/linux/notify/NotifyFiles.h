#pragma once

// Notifications as files, for whoever posts or reads them: the daemon and its
// tools. Needs nothing but the operating system, so that any program can link it.

#include <cstdint>
#include <filesystem>
#include <optional>
#include <string>
#include <string_view>
#include <system_error>
#include <variant>

namespace tal {

/// The directory of the notifications, in the runtime directory.
inline constexpr std::string_view kNotifyFolder = "notify";

/// Why something was not done, for a person to read.
struct NotifyError {
  std::string reason;
};

/// True for a name that can be posted: 1 to 255 bytes without "/" or NUL that
/// do not begin with "." (such files are the posters' own).
bool isNotificationName(std::string_view name);

/// Makes the notify directory where it is missing, in a runtime directory that
/// is there: mode 0775 whatever the umask, owned like the runtime directory.
std::error_code makeNotifyDirectory(const std::filesystem::path& directory);

/// The state of a notification, 0 when it was never posted. An error when what
/// stands there is no file, or holds anything but a decimal number of 64 bits.
std::variant<std::uint64_t, NotifyError> readNotificationState(const std::filesystem::path& directory,
                                                               std::string_view name);

/// Posts a notification; without a state it keeps the one it has. The file is
/// written anew and moved into place, so that readers see the old state or the
/// new, and each watcher is told once. Posters take turns; one that finds no
/// turn within a third of a second posts all the same. On failure nothing has
/// been posted.
std::optional<NotifyError> postNotification(const std::filesystem::path& directory, std::string_view name,
                                            std::optional<std::uint64_t> state);

/// As above, for those who must not wait: false when it is another's turn, and
/// nothing has been posted.
std::variant<bool, NotifyError> postNotificationAtOnce(const std::filesystem::path& directory,
                                                       std::string_view name,
                                                       std::optional<std::uint64_t> state);

}  // namespace tal
