#pragma once

// Who is at the other end of a Unix socket, as the kernel says.

#include <sys/types.h>

#include <vector>

namespace tal {

/// As of the moment in which the peer connected.
struct PeerCredentials {
  pid_t process_identifier = 0;
  uid_t user = static_cast<uid_t>(-1);
  gid_t group = static_cast<gid_t>(-1);
  std::vector<gid_t> supplementary_groups = {};
};

/// Of a connected socket. What the kernel does not tell keeps its initial value,
/// which is nobody's.
PeerCredentials peerCredentials(int socket);

}  // namespace tal
