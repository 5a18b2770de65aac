#pragma once

// One attempt to publish the inventory of accessories.

#include <atomic>
#include <functional>
#include <memory>
#include <string>

#include "accessories/BTAccess.h"
#include "core/EventVocabulary.h"
#include "core/Log.h"
#include "platform/CallstatBackend.h"
#include "platform/SerialQueue.h"

namespace tal {

/// Made on the reporting queue; everything else happens on the private queue,
/// since back-end and host may keep it waiting.
///
/// 1. `begin` opens a back-end session and waits for its back-ends, at most 9
///    seconds and without holding a thread.
/// 2. Back-ends found: the accessories are listed and published in one message.
///    Without anyone to publish to, the host is not asked.
/// 3. The session is closed and `done` called, once, on the private queue.
class RegistrationAttempt final : public std::enable_shared_from_this<RegistrationAttempt> {
 public:
  enum class Outcome {
    kPublished,
    kNoBackEnd,
    kNoBluetooth,  ///< the reason says why the host could not be asked
    kFailed,
  };
  using Done = std::function<void(Outcome, const std::string& reason)>;

  /// What is referred to outlives the queue's work.
  struct Dependencies {
    CallstatBackend& backend;
    BluetoothDevices& devices;
    const LogChannel& log;
    std::shared_ptr<SerialQueue> queue;
  };

  RegistrationAttempt(Dependencies dependencies, ReporterID reporter_id, Done done)
      : dependencies_(std::move(dependencies)), reporter_id_(reporter_id), done_(std::move(done)) {}
  RegistrationAttempt(const RegistrationAttempt&) = delete;
  RegistrationAttempt& operator=(const RegistrationAttempt&) = delete;

  void begin();

 private:
  void open();
  void backEndsFound(bool any);
  void publish();
  void end(Outcome outcome, const std::string& reason);

  Dependencies dependencies_;
  ReporterID reporter_id_;
  Done done_;  // empty once it has been called
  std::atomic<bool> answered_ = false;
  std::unique_ptr<CallstatSession> session_;
};

}  // namespace tal
