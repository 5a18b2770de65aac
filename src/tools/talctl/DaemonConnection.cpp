#include "tools/talctl/DaemonConnection.h"

#include <utility>

#include "tools/talctl/CommandFailure.h"
#include "tools/talctl/TextLayout.h"

namespace tal::talctl {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;

// A daemon that is alive greets within milliseconds; one that a service manager starts first, within this.
constexpr seconds kConnectTimeout{10};
// Far longer than any command runs: a command whose connection breaks fails, and does not send twice.
constexpr seconds kReconnectPause{600};
// How soon a broken connection is noticed while answers are waited for.
constexpr milliseconds kCheckInterval{100};

}  // namespace

DaemonConnection::DaemonConnection(const std::filesystem::path& socket, ReplyFunction on_reply) {
  client_.emplace(options(socket, std::move(on_reply)));
  std::unique_lock lock(mutex_);
  changed_.wait_for(lock, kConnectTimeout, [&] { return connected_ || failure_; });
  if (!connected_)
    throw CommandFailure(failure_.value_or("the daemon at " + socket.native() + " does not answer"));
}

DaemonConnection::~DaemonConnection() {
  if (client_) client_->close(milliseconds(0));  // no callback comes after this
}

client::Options DaemonConnection::options(const std::filesystem::path& socket, ReplyFunction on_reply) {
  client::Options options;
  options.socketPath = socket.native();
  options.durableAcknowledgement = true;
  options.reconnectMin = kReconnectPause;
  options.reconnectMax = kReconnectPause;
  options.onReply = std::move(on_reply);
  if (!options.onReply) {
    options.onReply = [this](const tal_reply& reply) {
      if (!reply.error) return;
      const std::lock_guard lock(mutex_);
      if (!refusal_) refusal_ = describe(*reply.error);
      changed_.notify_all();
    };
  }
  options.onConnected = [this](std::string_view server) {
    const std::lock_guard lock(mutex_);
    server_ = escapeControls(server);
    connected_ = true;
    changed_.notify_all();
  };
  const auto failed = [this](const tal_error& why) {
    const std::lock_guard lock(mutex_);
    if (!failure_) failure_ = describe(why);  // the first is the reason, what follows is its consequence
    changed_.notify_all();
  };
  options.onDisconnected = failed;
  options.onError = failed;
  return options;
}

void DaemonConnection::waitUntilAnswered() {
  while (client_->flush(kCheckInterval) != TAL_OK) check();
  check();
  const std::lock_guard lock(mutex_);
  if (refusal_) throw CommandFailure("the daemon refused: " + *refusal_);
}

void DaemonConnection::waitUntilClosed(milliseconds at_most) {
  std::unique_lock lock(mutex_);
  changed_.wait_for(lock, at_most, [&] { return failure_ || refusal_; });
  if (refusal_) throw CommandFailure("the daemon refused: " + *refusal_);
  if (!failure_) throw CommandFailure("the daemon has not ended");
}

void DaemonConnection::check() {
  const std::lock_guard lock(mutex_);
  if (failure_) throw CommandFailure("the connection to the daemon broke: " + *failure_);
}

std::string describe(const tal_error& error) {
  std::string text = error.message[0] ? error.message : tal_status_text(error.status);
  if (error.status == TAL_REFUSED)
    text += " (" + std::string(error.domain) + ' ' + std::to_string(error.code) + ')';
  return escapeControls(text);
}

}  // namespace tal::talctl
