// All brokers that messages go to, one publisher each.

#include <mosquitto.h>

#include <algorithm>
#include <mutex>
#include <utility>

#include "platform/linux/callstat/MqttPublisher.h"
#include "platform/linux/callstat/OutboxPublishers.h"

namespace tal {

namespace {

class MqttPublishers final : public OutboxPublishers {
 public:
  explicit MqttPublishers(Dependencies dependencies) : dependencies_(std::move(dependencies)) {
    mosquitto_lib_init();
    known_ = OutboxReader(dependencies_.store_path).brokers();
  }
  MqttPublishers(const MqttPublishers&) = delete;
  MqttPublishers& operator=(const MqttPublishers&) = delete;
  ~MqttPublishers() override {
    publishers_.clear();
    mosquitto_lib_cleanup();
  }

  std::vector<std::string> serve(const std::vector<BrokerAddress>& brokers) override {
    const std::lock_guard lock(mutex_);
    if (stopped_) return {};
    if (brokers != brokers_) change(brokers);
    std::vector<std::string> names;
    for (const BrokerAddress& broker : brokers_) names.push_back(broker.uri);
    return names;
  }
  void messageWaits() override {
    const std::lock_guard lock(mutex_);
    for (const auto& publisher : publishers_) publisher->messageWaits();
  }
  void flush(std::int64_t session) override {
    const std::lock_guard lock(mutex_);
    for (const auto& publisher : publishers_) publisher->flush(session);
  }
  void stop() override {
    const std::lock_guard lock(mutex_);
    stopped_ = true;
    publishers_.clear();
  }

 private:
  static bool has(const std::vector<BrokerAddress>& brokers, const std::string& uri) {
    return std::any_of(brokers.begin(), brokers.end(),
                       [&uri](const BrokerAddress& broker) { return broker.uri == uri; });
  }

  // Newcomers join before others leave: they take over what those did not have.
  // No brokers at all may be a mistake in the settings; it takes nothing away.
  void change(const std::vector<BrokerAddress>& brokers) {
    std::erase_if(publishers_,
                  [&](const auto& publisher) { return !has(brokers, publisher->address().uri); });
    for (const BrokerAddress& broker : brokers) {
      if (has(brokers_, broker.uri)) continue;
      dependencies_.store.append({.table = StoreTable::kRtcBrokerJoins, .name = broker.uri});
      if (std::find(known_.begin(), known_.end(), broker.uri) == known_.end()) known_.push_back(broker.uri);
    }
    if (!brokers.empty()) {
      std::erase_if(known_, [&](const std::string& uri) {
        if (has(brokers, uri)) return false;
        dependencies_.store.append({.table = StoreTable::kRtcBrokerLeaves, .name = uri});
        return true;
      });
    }
    for (const BrokerAddress& broker : brokers) {
      if (!has(brokers_, broker.uri)) {
        publishers_.push_back(std::make_unique<MqttPublisher>(dependencies_, broker));
      }
    }
    brokers_ = brokers;
  }

  Dependencies dependencies_;
  std::mutex mutex_;
  bool stopped_ = false;
  std::vector<BrokerAddress> brokers_;
  std::vector<std::string> known_;  // to the store
  std::vector<std::unique_ptr<MqttPublisher>> publishers_;
};

}  // namespace

std::unique_ptr<OutboxPublishers> makeOutboxPublishers(OutboxPublishers::Dependencies dependencies) {
  return std::make_unique<MqttPublishers>(std::move(dependencies));
}

}  // namespace tal
