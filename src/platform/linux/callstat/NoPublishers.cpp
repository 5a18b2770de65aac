#include <atomic>

#include "platform/linux/callstat/OutboxPublishers.h"

namespace tal {

namespace {

class NoPublishers final : public OutboxPublishers {
 public:
  explicit NoPublishers(const LogChannel& log) : log_(log) {}

  std::vector<std::string> serve(const std::vector<BrokerAddress>& brokers) override {
    if (!brokers.empty() && !told_.exchange(true)) {
      TAL_LOG_ERROR(log_, "built without libmosquitto: brokers are not served");
    }
    return {};
  }
  void messageWaits() override {}
  void flush(std::int64_t) override {}
  void stop() override {}

 private:
  const LogChannel& log_;
  std::atomic<bool> told_ = false;
};

}  // namespace

std::unique_ptr<OutboxPublishers> makeOutboxPublishers(OutboxPublishers::Dependencies dependencies) {
  return std::make_unique<NoPublishers>(dependencies.log);
}

}  // namespace tal
