#pragma once

#include <cstdint>
#include <filesystem>
#include <string>
#include <unordered_map>
#include <vector>

#include "platform/linux/callstat/Publications.h"
#include "platform/linux/store/SqliteConnection.h"

namespace tal {

/// Reads the outbox beside the store's writer, which it never holds up. One thread
/// at a time; everything throws StoreError.
class OutboxReader {
 public:
  explicit OutboxReader(const std::filesystem::path& store);

  /// The brokers that the store keeps messages for.
  std::vector<std::string> brokers();
  /// The message up to which the broker has everything.
  std::int64_t confirmedBy(const std::string& broker);
  /// The committed messages behind this one, in order, as many as asked for at
  /// most and about a mebibyte.
  std::vector<OutboxMessage> readAfter(std::int64_t number, std::int64_t most);
  /// Valid until the next call.
  const OutboxSession& sessionOf(std::int64_t row);

 private:
  SqliteConnection store_;
  SqliteStatement brokers_;
  SqliteStatement confirmed_;
  SqliteStatement messages_;
  SqliteStatement session_;
  std::unordered_map<std::int64_t, OutboxSession> sessions_;
};

}  // namespace tal
