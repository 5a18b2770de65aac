// Signposts: nothing but a look at a pointer, until the library with the trace
// points is loaded. The pointers are the one state that this library keeps beside
// its connections: a signpost has no connection.

#include <dlfcn.h>

#include <atomic>
#include <cstdlib>
#include <cstring>
#include <mutex>
#include <string>

#include "client/talreporting.h"

namespace {

using SignpostFunction = void (*)(const char* subsystem, const char* name);

std::atomic<SignpostFunction> g_begin{nullptr};
std::atomic<SignpostFunction> g_end{nullptr};
std::mutex g_loading;

constexpr char kEnableVariable[] = "TALREPORTING_SIGNPOSTS";
constexpr char kLibraryVariable[] = "TALREPORTING_SIGNPOST_LIBRARY";
constexpr char kLibraryBeside[] = "/talreporting/libtalreporting-signposts.so";

// Below the directory that this library itself was loaded from.
std::string libraryPath() {
  if (const char* named = ::secure_getenv(kLibraryVariable)) return named;
  Dl_info self{};
  if (::dladdr(&g_begin, &self) == 0 || !self.dli_fname) return "";
  const std::string path = self.dli_fname;
  const auto slash = path.rfind('/');
  return (slash == std::string::npos ? "." : path.substr(0, slash)) + kLibraryBeside;
}

bool load() {
  // It stays: a thread may be within it whenever.
  void* library = ::dlopen(libraryPath().c_str(), RTLD_NOW | RTLD_LOCAL | RTLD_NODELETE);
  if (!library) return false;
  const auto begin = reinterpret_cast<SignpostFunction>(::dlsym(library, "talreporting_provider_begin"));
  const auto end = reinterpret_cast<SignpostFunction>(::dlsym(library, "talreporting_provider_end"));
  if (!begin || !end) return false;
  g_begin.store(begin, std::memory_order_release);
  g_end.store(end, std::memory_order_release);
  return true;
}

__attribute__((constructor)) void enableWhereAsked() {
  const char* asked = ::secure_getenv(kEnableVariable);
  if (asked && std::strcmp(asked, "1") == 0) talreporting_signpost_enable();
}

}  // namespace

extern "C" {

tal_status talreporting_signpost_enable() noexcept {
  try {
    const std::lock_guard lock(g_loading);
    return g_begin.load(std::memory_order_relaxed) || load() ? TAL_OK : TAL_OUT_OF_MEMORY;
  } catch (...) {
    return TAL_OUT_OF_MEMORY;
  }
}

void talreporting_signpost_begin(const char* subsystem, const char* name) noexcept {
  if (const auto begin = g_begin.load(std::memory_order_acquire)) begin(subsystem, name);
}

void talreporting_signpost_end(const char* subsystem, const char* name) noexcept {
  if (const auto end = g_end.load(std::memory_order_acquire)) end(subsystem, name);
}

}  // extern "C"
