// The sessions of a connection as they have to be set up again after it broke.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "client/talreporting.h"

namespace tal::clientlib {

/// Follows the requests of a program with what the daemon makes of them. It is told of a request when that
/// leaves the queue, so that it stands where a repetition of the queue begins. Lives on the library's thread.
class SessionModels {
 public:
  /// A request that a program made. `arguments` is what it sent with it; `number` is the service type, where
  /// it sets one.
  void apply(tal_operation operation, std::int64_t reporter, std::uint64_t number,
             std::span<const unsigned char> arguments);

  /// Calls `request` for everything that sets the sessions up, in the order of their creation.
  using Request = std::function<void(tal_operation operation, std::int64_t reporter,
                                     std::span<const unsigned char> arguments)>;
  void setUp(const Request& request) const;

  /// The oldest session that is started.
  std::optional<std::int64_t> firstStarted() const;

 private:
  struct Session {
    std::uint64_t number = 0;
    std::optional<std::uint64_t> serviceType;
    /// Encoded values by key.
    std::map<std::string, std::vector<unsigned char>, std::less<>> configuration;
    bool started = false;
  };

  void configure(Session& session, std::span<const unsigned char> arguments);
  std::vector<const std::pair<const std::int64_t, Session>*> inOrder() const;

  std::map<std::int64_t, Session> sessions_;
  std::uint64_t created_ = 0;
};

}  // namespace tal::clientlib
