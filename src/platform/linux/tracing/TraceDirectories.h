#pragma once

#include <filesystem>
#include <string>

namespace tal {

/// Makes a new directory for one trace below `parent` and takes away the oldest
/// ones beyond the number that is kept. Empty on failure, with the reason in
/// `error`.
struct TraceDirectory {
  std::filesystem::path path = {};
  std::string error = {};
};
TraceDirectory makeTraceDirectory(const std::filesystem::path& parent, const std::string& local_time);

}  // namespace tal
