#include "platform/linux/tracing/TraceDirectories.h"

#include <algorithm>
#include <cstddef>
#include <system_error>
#include <vector>

namespace tal {

namespace {

namespace fs = std::filesystem;

constexpr char kPrefix[] = "perftrail-";
// A trace may be some hundred megabytes; engineers look at the last few.
constexpr std::size_t kMostTraces = 8;
constexpr int kMostInOneSecond = 100;

void removeOldest(const fs::path& parent) {
  std::error_code error;
  std::vector<std::pair<fs::file_time_type, fs::path>> traces;
  for (const auto& entry : fs::directory_iterator(parent, error)) {
    const bool ours = entry.path().filename().string().starts_with(kPrefix);
    if (!ours || entry.symlink_status(error).type() != fs::file_type::directory) continue;
    traces.emplace_back(entry.last_write_time(error), entry.path());
  }
  std::sort(traces.begin(), traces.end());
  for (std::size_t i = 0; i + kMostTraces <= traces.size(); ++i) fs::remove_all(traces[i].second, error);
}

}  // namespace

TraceDirectory makeTraceDirectory(const fs::path& parent, const std::string& local_time) {
  removeOldest(parent);
  std::error_code error;
  for (int i = 1; i <= kMostInOneSecond; ++i) {
    const fs::path path = parent / (kPrefix + local_time + '-' + std::to_string(i));
    if (fs::create_directory(path, error)) return {path, ""};
    if (error) return {{}, error.message()};
  }
  return {{}, "too many traces of one second"};
}

}  // namespace tal
