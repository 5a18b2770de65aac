#pragma once

// A statistics back-end that answers when the test says so, and a pool whose
// queues the test drives by hand.

#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "platform/CallstatBackend.h"
#include "platform/SerialQueuePool.h"
#include "support/HandDriven.h"

namespace tal::test {

/// Makes queues on the test's clock.
class HandQueuePool final : public SerialQueuePool {
 public:
  explicit HandQueuePool(HandClock& clock) : clock_(clock) {}
  HandQueuePool(const HandQueuePool&) = delete;
  HandQueuePool& operator=(const HandQueuePool&) = delete;
  ~HandQueuePool() override {
    for (const auto& queue : queues) queue->dropAll();
  }

  std::shared_ptr<SerialQueue> makeQueue(std::string_view label) override {
    labels.emplace_back(label);
    queues.push_back(std::make_shared<HandQueue>(clock_));
    return queues.back();
  }
  void runUntilIdle() {
    for (const auto& queue : queues) queue->runUntilIdle();
  }

  std::vector<std::string> labels;
  std::vector<std::shared_ptr<HandQueue>> queues;

 private:
  HandClock& clock_;
};

/// Records what sessions are told.
class FakeCallstatBackend final : public CallstatBackend {
 public:
  struct Sent {
    std::uint16_t category;
    std::uint16_t type;
    MessageDict payload;
  };
  /// Outlives the session that it tells of.
  struct Record {
    MessageDict session_info;
    MessageDict user_info;
    CallstatSession::CompletionHandler handler;
    std::vector<Sent> sent;
    int flushes = 0;
    bool open = true;
  };

  std::optional<CallstatToken> newHierarchyTokenFromParentToken(const CallstatToken* parent) override {
    if (refuse_tokens) return std::nullopt;
    return CallstatToken{parent ? parent->text + "/child" : "root"};
  }
  std::unique_ptr<CallstatSession> initWithSessionInfo(MessageDict session_info, MessageDict user_info,
                                                       const std::vector<std::string>&) override {
    records.push_back(std::make_shared<Record>());
    records.back()->session_info = std::move(session_info);
    records.back()->user_info = std::move(user_info);
    return std::make_unique<Session>(*this, records.back());
  }

  bool refuse_tokens = false;
  /// What a session is answered at once; nothing: the test answers by the handler.
  std::optional<std::vector<std::string>> backends = std::vector<std::string>{};
  CallstatSession::Error send_error;
  std::vector<std::shared_ptr<Record>> records;

 private:
  class Session final : public CallstatSession {
   public:
    Session(FakeCallstatBackend& owner, std::shared_ptr<Record> record)
        : owner_(owner), record_(std::move(record)) {}
    ~Session() override { record_->open = false; }

    void startConfigurationWithCompletionHandler(CompletionHandler handler) override {
      record_->handler = handler;
      if (owner_.backends) handler(*owner_.backends);
    }
    Error sendMessage(std::uint16_t category, std::uint16_t type, const MessageDict& payload) override {
      if (owner_.send_error) return owner_.send_error;
      record_->sent.push_back({category, type, payload});
      return std::nullopt;
    }
    void flushMessages() override { ++record_->flushes; }
    std::string description() const override { return "fake"; }

   private:
    FakeCallstatBackend& owner_;
    std::shared_ptr<Record> record_;
  };
};

}  // namespace tal::test
