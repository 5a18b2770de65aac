// Stands in where libsystemd is missing.

#include "platform/linux/ipc/ServiceManager.h"

namespace tal {

std::optional<FileDescriptor> takeInheritedSocket() { return std::nullopt; }

void tellServiceManagerReady() {}

void tellServiceManagerStopping() {}

}  // namespace tal
