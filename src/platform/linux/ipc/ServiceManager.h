#pragma once

// What the service manager that started the daemon hands over and is told.
// Without libsystemd there is none, and every operation does nothing.

#include <optional>

#include "platform/linux/process/FileDescriptor.h"

namespace tal {

/// The one listening Unix stream socket that was inherited, if there is one.
/// Throws StartupError when something else was passed.
std::optional<FileDescriptor> takeInheritedSocket();

/// Clients can connect.
void tellServiceManagerReady();

/// The orderly end has begun.
void tellServiceManagerStopping();

}  // namespace tal
