#pragma once

// The latest state of every monitored feature, and those who want to know of
// each new one.

#include <cstdint>
#include <functional>
#include <map>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>

#include "core/MessageDict.h"

namespace tal {

/// Feature name -> feature state, observed feature by feature. Any thread; held
/// by shared pointers, since observers may outlast whoever files.
///
/// Whoever reads and then files what depends on it, or ends several observations
/// as one, holds `lock` meanwhile. It is recursive: observers run under it and
/// may call anything here, even end observations, their own included.
class SystemMonitorDictionary {
 public:
  using Observer = std::function<void(const MessageDict& state)>;
  using Lock = std::unique_lock<std::recursive_mutex>;

  /// The observer is told of changes while this lives. The dictionary outlives it.
  class Observation {
   public:
    Observation(Observation&& other) noexcept;
    Observation& operator=(Observation&&) = delete;
    ~Observation();

   private:
    friend class SystemMonitorDictionary;
    Observation(SystemMonitorDictionary& dictionary, std::string feature, std::uint64_t number);

    SystemMonitorDictionary* dictionary_;
    std::string feature_;
    std::uint64_t number_;
  };

  SystemMonitorDictionary() = default;
  SystemMonitorDictionary(const SystemMonitorDictionary&) = delete;
  SystemMonitorDictionary& operator=(const SystemMonitorDictionary&) = delete;

  [[nodiscard]] Lock lock() const { return Lock(mutex_); }

  /// The state filed last, or nothing.
  std::optional<MessageDict> stateOf(std::string_view feature) const;

  /// Files a state and tells the feature's observers, in the order in which they
  /// began, before it returns. One whose observation ends meanwhile is not told
  /// any more; one that begins meanwhile is told of the next state.
  void file(std::string_view feature, MessageDict state);

  /// `observer` is called for every state filed from now on, on the filing thread.
  [[nodiscard]] Observation observe(std::string_view feature, Observer observer);

 private:
  struct Entry {
    std::optional<MessageDict> state;
    std::map<std::uint64_t, Observer> observers;  // by number, so in the order of their beginning
  };

  Entry& entryOf(std::string_view feature);
  void endObservation(const std::string& feature, std::uint64_t number);

  mutable std::recursive_mutex mutex_;
  std::uint64_t last_number_ = 0;
  std::map<std::string, Entry, std::less<>> entries_;
};

}  // namespace tal
