// The dictionary that a program builds, encoded while it grows, so that a send has only bytes to copy.
#pragma once

#include <cstddef>
#include <cstdint>

#include "client/talreporting.h"

/// The entries of the message stand in `data` without the head of the outermost map, whose count is known
/// only when the message is sent; nested maps and arrays have indefinite lengths. One thread at a time.
struct tal_message {
  explicit tal_message(std::size_t wanted);
  ~tal_message();
  tal_message(const tal_message&) = delete;
  tal_message& operator=(const tal_message&) = delete;

  void reset();
  /// Writes the key, or checks that none is wanted, and makes room for `valueBytes` and one head. Returns
  /// where the value goes, or null when the message is or has just been spoiled.
  unsigned char* begin(const char* key, std::size_t keyBytes, std::size_t valueBytes);
  /// Closes what `begin` opened: the value ends at `end`.
  void finish(const unsigned char* end) { size = static_cast<std::size_t>(end - data); }
  void open(const char* key, std::size_t keyBytes, bool array);
  void close();
  void spoil(tal_status why) { status = why; }
  /// TAL_OK when the message can be sent.
  tal_status sendable() const { return status != TAL_OK || depth == 0 ? status : TAL_INVALID; }

  unsigned char* data = nullptr;
  std::size_t size = 0;
  std::size_t capacity = 0;
  /// Entries of the outermost map.
  std::uint32_t entries = 0;
  /// Nested containers that are open; bit n of `arrays` tells whether the n-th is an array.
  std::uint32_t depth = 0;
  std::uint32_t arrays = 0;
  tal_status status = TAL_OK;

 private:
  bool grow(std::size_t more);
};
