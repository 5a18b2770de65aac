#pragma once

#include <filesystem>
#include <string_view>
#include <system_error>

namespace tal {

/// Writes the whole file under a temporary name beside it, makes it durable and
/// moves it into place, so that a reader sees the old content or the new, after
/// a power loss too. Readable by owner and group. On failure the old file stands
/// and no temporary one is left.
std::error_code replaceFile(const std::filesystem::path& path, std::string_view text);

}  // namespace tal
