// Descriptions of failures, as programs get to see them.
#pragma once

#include <algorithm>
#include <cstring>
#include <string>
#include <string_view>

#include "client/talreporting.h"

namespace tal::clientlib {

constexpr std::string_view kClientDomain = "client";
constexpr std::string_view kSystemDomain = "system";

/// The error numbers of the daemon that change what the library does next.
constexpr std::string_view kIpcDomain = "org.vantle.talsys.ipc";
constexpr std::int64_t kFrameSizeCode = 4;

template <std::size_t size>
void copyText(char (&target)[size], std::string_view text) {
  const std::size_t bytes = std::min(text.size(), size - 1);
  std::memcpy(target, text.data(), bytes);
  target[bytes] = '\0';
}

inline tal_error makeError(tal_status status, std::int64_t code, std::string_view domain,
                           std::string_view message) {
  tal_error error{};
  error.status = status;
  error.code = code;
  copyText(error.domain, domain);
  copyText(error.message, message);
  return error;
}

inline tal_error localError(tal_status status) {
  return makeError(status, 0, kClientDomain, tal_status_text(status));
}

/// A failed system call, described as "<what>: <the system's text>".
inline tal_error systemError(tal_status status, int number, const std::string& what) {
  char buffer[96];
  // The variant of the GNU library, which returns the text.
  return makeError(status, number, kSystemDomain, what + ": " + strerror_r(number, buffer, sizeof buffer));
}

}  // namespace tal::clientlib
