#include "platform/linux/ipc/PeerCredentials.h"

#include <sys/socket.h>

#include <cerrno>

namespace tal {

PeerCredentials peerCredentials(int socket) {
  PeerCredentials peer;
  ucred credentials{};
  socklen_t size = sizeof credentials;
  if (::getsockopt(socket, SOL_SOCKET, SO_PEERCRED, &credentials, &size) == 0) {
    peer.process_identifier = credentials.pid;
    peer.user = credentials.uid;
    peer.group = credentials.gid;
  }
  // The first call tells how many there are.
  socklen_t group_bytes = 0;
  while (::getsockopt(socket, SOL_SOCKET, SO_PEERGROUPS, peer.supplementary_groups.data(), &group_bytes) !=
         0) {
    if (errno != ERANGE) {
      peer.supplementary_groups.clear();
      return peer;
    }
    peer.supplementary_groups.resize(group_bytes / sizeof(gid_t));
  }
  peer.supplementary_groups.resize(group_bytes / sizeof(gid_t));
  return peer;
}

}  // namespace tal
