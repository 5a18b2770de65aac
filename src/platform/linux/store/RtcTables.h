#pragma once

// How the books of the real-time messages are kept: what leaves the outbox, and
// when a session is not referred to any more.

#include <cstdint>

#include "platform/linux/store/SqliteConnection.h"

namespace tal {

/// The tables rtc_sessions, rtc_outbox and rtc_brokers of an open store. One
/// thread at a time; everything throws StoreError.
class RtcTables {
 public:
  /// `connection` outlives the object and has the tables.
  explicit RtcTables(SqliteConnection& connection);

  /// Deletes what every broker has.
  void dropConfirmed();

  bool outboxIsOver(std::int64_t most_bytes) { return outboxOverhang(most_bytes) > 0; }
  /// Deletes a slice of the oldest messages, no more than the outbox is over this.
  void trimOutbox(std::int64_t most_bytes);

  /// Deletes sessions that have ended and that no message refers to.
  void dropUnusedSessions() { drop_sessions_.run(); }

  /// Messages that left the outbox though a broker did not have them.
  void noteLosses(std::int64_t messages) { losses_ += messages; }
  std::int64_t takeLosses();

 private:
  std::int64_t outboxOverhang(std::int64_t most_bytes);

  SqliteConnection& connection_;
  SqliteStatement drop_confirmed_;
  SqliteStatement drop_sessions_;
  SqliteStatement span_;
  SqliteStatement trim_;
  std::int64_t losses_ = 0;
};

}  // namespace tal
