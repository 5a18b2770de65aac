#include "platform/linux/tracing/LinuxTracing.h"

#include <system_error>

#include "platform/linux/tracing/RealSemaphore.h"

namespace tal {

namespace {

namespace fs = std::filesystem;

// Everything is found from where this program lies, so that an installation can be moved; a directory that
// the build names absolutely stays what it is.
fs::path installed(const char* directory, const char* name) {
  std::error_code error;
  const fs::path program = fs::read_symlink("/proc/self/exe", error);
  return (program.parent_path() / ".." / directory / name).lexically_normal();
}

}  // namespace

LinuxTracing::LinuxTracing(const Options& options)
    : perftrail_({.helper = installed(TAL_LIBEXEC_DIR, "talreporting/tal-perftrail"),
                  .home = options.runtime_directory / "lttng",
                  .diagnostic_log = options.diagnostic_log,
                  .clock = options.clock}),
      skein_(installed(TAL_LIB_DIR, "talreporting"), options.log),
      client_files_(options.log_directory),
      platform_{.perftrail = perftrail_,
                .skein = skein_,
                .perf_data = perf_data_,
                .client_files = client_files_,
                .property_lists = property_lists_,
                .make_semaphore = [] { return std::make_unique<RealSemaphore>(); }} {}

}  // namespace tal
