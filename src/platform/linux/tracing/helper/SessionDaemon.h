#pragma once

#include <sys/types.h>

#include <string>

namespace tal {

/// The tracer's session daemon: the one that runs already, or one of our own. Root
/// has one place for it on the whole machine; anybody else's own one lives in the
/// private home.
class SessionDaemon {
 public:
  SessionDaemon() = default;
  SessionDaemon(const SessionDaemon&) = delete;
  SessionDaemon& operator=(const SessionDaemon&) = delete;
  /// Ends the one that was started, and waits for that.
  ~SessionDaemon();

  /// Empty on success, else why there is none.
  std::string ensure(const std::string& private_home);

 private:
  /// The exit status of our own when it has ended, else 0.
  int hasEnded();

  pid_t own_ = -1;
};

}  // namespace tal
