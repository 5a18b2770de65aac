#pragma once

#include <cstddef>
#include <filesystem>
#include <string>
#include <string_view>
#include <vector>

namespace tal {

/// Files of the kernel and of drivers, below a root directory that is "/" but for
/// tests and recorded trees. Any thread.
class HostFiles {
 public:
  /// Larger files are not what they are taken for.
  static constexpr std::size_t kLargestFileBytes = std::size_t{256} * 1024;

  struct Content {
    std::string text;
    int error = 0;  ///< an errno, with the text empty; or 0

    bool ok() const { return error == 0; }
  };

  explicit HostFiles(std::filesystem::path root) : root_(std::move(root)) {}

  /// The whole of a regular file; anything else, which could keep the reader
  /// waiting, is EINVAL, and a file that is too large EFBIG. `path` begins with "/".
  Content read(std::string_view path) const;

  /// The names in a directory, sorted; none where it is missing.
  std::vector<std::string> namesIn(std::string_view path) const;

  /// Where a link of a directory leads, without the root; empty where it leads nowhere.
  std::string resolved(std::string_view path) const;

 private:
  std::filesystem::path below(std::string_view path) const;

  std::filesystem::path root_;
};

}  // namespace tal
