#pragma once

// Reading of the small files in which the kernel tells of itself.

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>

namespace tal {

/// As much as a capture takes of one such file, unless more is said.
inline constexpr std::size_t kMostProcFileBytes = std::size_t{64} << 10;

/// The file's beginning, `path` relative to the directory (or AT_FDCWD); nothing
/// when it cannot be read: not permitted, not there, its process has gone. What
/// would make the reader wait counts as the end.
std::optional<std::string> readProcFile(int directory, const char* path,
                                        std::size_t most_bytes = kMostProcFileBytes);
std::optional<std::string> readProcFile(const std::string& path, std::size_t most_bytes = kMostProcFileBytes);

/// The value of "key:   value" among the lines of the text, else empty.
std::string_view procField(std::string_view text, std::string_view key);

/// Cuts the first line, without its end, off the text.
std::string_view takeLine(std::string_view& text);

}  // namespace tal
