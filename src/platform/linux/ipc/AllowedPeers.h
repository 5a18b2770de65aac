#pragma once

// The administrator's rule for who may connect.

#include <optional>
#include <string>
#include <vector>

#include "platform/SettingsStore.h"
#include "platform/linux/ipc/PeerCredentials.h"

namespace tal {

/// The settings `allowed_users` and `allowed_groups`.
struct AllowedPeers {
  /// Names or numbers. Without either list, anybody may connect; with one, only
  /// those whom it names, and an empty one names nobody.
  std::optional<std::vector<std::string>> users;
  std::optional<std::vector<std::string>> groups;

  bool includesEverybody() const { return !users && !groups; }

  /// Looks names up, which may go over the network: not on a thread that others
  /// wait for.
  bool includes(const PeerCredentials& peer) const;

  friend bool operator==(const AllowedPeers&, const AllowedPeers&) = default;
};

/// A setting that is no list of texts or integers names nobody but what it spells.
AllowedPeers readAllowedPeers(const SettingsStore& settings);

}  // namespace tal
