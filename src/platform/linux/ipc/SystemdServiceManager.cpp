#include <sys/socket.h>
#include <systemd/sd-daemon.h>

#include "platform/linux/ipc/ServiceManager.h"
#include "platform/linux/process/StartupError.h"

namespace tal {

std::optional<FileDescriptor> takeInheritedSocket() {
  constexpr int kForgetForChildren = 1;
  const int count = sd_listen_fds(kForgetForChildren);
  if (count <= 0) return std::nullopt;
  if (count > 1) throw StartupError("the service manager passed more than one socket");
  FileDescriptor inherited(SD_LISTEN_FDS_START);
  constexpr int kListening = 1;
  if (sd_is_socket_unix(inherited.get(), SOCK_STREAM, kListening, nullptr, 0) <= 0) {
    throw StartupError("the service manager passed something else than a listening Unix stream socket");
  }
  return inherited;
}

void tellServiceManagerReady() { sd_notify(0, "READY=1"); }

void tellServiceManagerStopping() { sd_notify(0, "STOPPING=1"); }

}  // namespace tal
