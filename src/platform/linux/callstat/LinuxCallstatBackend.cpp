#include "platform/linux/callstat/LinuxCallstatBackend.h"

#include <sys/random.h>

#include <array>
#include <utility>

#include "platform/linux/callstat/LinuxCallstatSession.h"
#include "platform/linux/process/StartupError.h"
#include "platform/linux/store/SqliteConnection.h"

namespace tal {

namespace {

constexpr std::size_t kTokenBytes = 16;

std::int64_t lastSessionIn(const std::filesystem::path& store_path) {
  try {
    SqliteConnection store(store_path, SqliteConnection::Access::kReadOnly);
    return store.integer("SELECT coalesce(max(id), 0) FROM rtc_sessions");
  } catch (const StoreError& error) {
    throw StartupError("cannot read the store " + store_path.string() + ": " + error.what());
  }
}

}  // namespace

LinuxCallstatBackend::LinuxCallstatBackend(Dependencies dependencies)
    : dependencies_(std::move(dependencies)),
      settings_reader_(dependencies_.settings, dependencies_.log),
      publishers_(makeOutboxPublishers({.store = dependencies_.store,
                                        .store_path = dependencies_.store_path,
                                        .settings = settings_reader_,
                                        .clock = dependencies_.clock,
                                        .log = dependencies_.log})),
      last_session_(lastSessionIn(dependencies_.store_path)) {
  // Sessions of a daemon that did not end in order are over too.
  if (last_session_ > 0) {
    dependencies_.store.append({.table = StoreTable::kRtcSessionEnds, .number = 0, .detail = last_session_});
  }
  // What an earlier daemon could not send.
  publishers_->serve(settings_reader_.read().brokers);
}

std::optional<CallstatToken> LinuxCallstatBackend::newHierarchyTokenFromParentToken(
    const CallstatToken* parent) {
  constexpr std::string_view kHex = "0123456789abcdef";
  std::array<unsigned char, kTokenBytes> bytes{};
  if (::getrandom(bytes.data(), bytes.size(), GRND_NONBLOCK) != static_cast<ssize_t>(bytes.size())) {
    return std::nullopt;
  }
  CallstatToken token;
  if (parent) token.text = parent->text + '.';
  for (const unsigned char byte : bytes) {
    token.text += kHex[byte >> 4];
    token.text += kHex[byte & 15];
  }
  return token;
}

std::unique_ptr<CallstatSession> LinuxCallstatBackend::initWithSessionInfo(MessageDict session_info,
                                                                           MessageDict user_info,
                                                                           const std::vector<std::string>&) {
  return std::make_unique<LinuxCallstatSession>(
      LinuxCallstatSession::Dependencies{.store = dependencies_.store,
                                         .settings = settings_reader_,
                                         .publishers = *publishers_,
                                         .clock = dependencies_.clock,
                                         .log = dependencies_.log},
      ++last_session_, std::move(session_info), std::move(user_info));
}

}  // namespace tal
