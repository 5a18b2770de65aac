#pragma once

#include <filesystem>

namespace tal {

/// Held by the one daemon that works on a directory. The kernel takes it back
/// when the process ends, however it ends; the file itself stays.
class InstanceLock {
 public:
  /// Takes the lock on `<directory>/talreportingd.lock`; the directory exists.
  /// Throws StartupError when another process holds it (and then changes
  /// nothing) or the file cannot be made.
  explicit InstanceLock(const std::filesystem::path& directory);
  InstanceLock(const InstanceLock&) = delete;
  InstanceLock& operator=(const InstanceLock&) = delete;
  ~InstanceLock();

 private:
  int file_ = -1;
};

}  // namespace tal
