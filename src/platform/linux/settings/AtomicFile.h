#pragma once

#include <sys/types.h>

#include <filesystem>
#include <string_view>
#include <system_error>

namespace tal {

inline constexpr mode_t kReadableByOwnerAndGroup = 0640;

/// Writes the whole file under a temporary name beside it, makes it durable and
/// moves it into place, so that a reader sees the old content or the new, after
/// a power loss too. On failure the old file stands and no temporary one is left.
std::error_code replaceFile(const std::filesystem::path& path, std::string_view text,
                            mode_t mode = kReadableByOwnerAndGroup);

}  // namespace tal
