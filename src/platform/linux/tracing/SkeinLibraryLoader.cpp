#include "platform/linux/tracing/SkeinLibraryLoader.h"

#include <dlfcn.h>

#include <cstdlib>

#include "platform/linux/tracing/SkeinLibraryEntry.h"

namespace tal {

namespace {

constexpr char kLibraryVariable[] = "TALREPORTING_SKEIN_LIBRARY";
constexpr char kLibraryFile[] = "libtalskein.so";

}  // namespace

void* SkeinLibraryLoader::load() const {
  const char* named = ::secure_getenv(kLibraryVariable);
  const std::filesystem::path file = named ? std::filesystem::path(named) : library_directory_ / kLibraryFile;
  void* library = ::dlopen(file.c_str(), RTLD_NOW | RTLD_LOCAL);
  if (!library) TAL_LOG(log_, "no trace models: ", ::dlerror());
  return library;
}

void* SkeinLibraryLoader::classNamed(const char* name) {
  if (!library_) library_ = load();
  if (!*library_) return nullptr;
  const auto entry = reinterpret_cast<SkeinEntry>(::dlsym(*library_, kSkeinEntryName));
  if (entry) return entry(name);
  TAL_LOG(log_, "no trace models: the library is of another version");
  return nullptr;
}

SkeinTraceModelClass* SkeinLibraryLoader::traceModelClass() {
  return static_cast<SkeinTraceModelClass*>(classNamed(kSkeinTraceModelClassName));
}
SkeinSignpostModelClass* SkeinLibraryLoader::signpostModelClass() {
  return static_cast<SkeinSignpostModelClass*>(classNamed(kSkeinSignpostModelClassName));
}
SkeinProbeFactoryClass* SkeinLibraryLoader::probeFactoryClass() {
  return static_cast<SkeinProbeFactoryClass*>(classNamed(kSkeinProbeFactoryClassName));
}

// Only where it differs: the environment belongs to all threads, and one that reads
// it at this moment must not find it moved. After the first trace it never changes.
void SkeinLibraryLoader::acknowledge() {
  const char* now = std::getenv(kSkeinAcknowledgement);
  if (!now || std::string_view(now) != "1") ::setenv(kSkeinAcknowledgement, "1", /*overwrite=*/1);
}

}  // namespace tal
