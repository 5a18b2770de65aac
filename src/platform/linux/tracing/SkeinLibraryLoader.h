#pragma once

#include <filesystem>
#include <optional>

#include "core/Log.h"
#include "platform/SkeinTraceModel.h"

namespace tal {

/// Loads the trace-model library when the first class is asked for, and keeps it.
/// The file is what the environment variable TALREPORTING_SKEIN_LIBRARY names, or
/// libtalskein.so in the library directory.
class SkeinLibraryLoader final : public SkeinLibrary {
 public:
  SkeinLibraryLoader(std::filesystem::path library_directory, const LogChannel& log)
      : library_directory_(std::move(library_directory)), log_(log) {}

  SkeinTraceModelClass* traceModelClass() override;
  SkeinSignpostModelClass* signpostModelClass() override;
  SkeinProbeFactoryClass* probeFactoryClass() override;
  void acknowledge() override;

 private:
  void* classNamed(const char* name);
  void* load() const;

  const std::filesystem::path library_directory_;
  const LogChannel& log_;
  std::optional<void*> library_;  // null: it could not be loaded
};

}  // namespace tal
