#pragma once

#include <stdexcept>
#include <string>

namespace tal {

/// Why the store's file could not be read or written. Stays within the store:
/// the writer turns it into a StartupError or into a retry.
class StoreError : public std::runtime_error {
 public:
  /// True when trying again on the same open file may help (the disk is full,
  /// someone else holds the file); otherwise it is better opened anew.
  enum class Cause { kPassing, kLasting };

  StoreError(Cause cause, const std::string& reason) : std::runtime_error(reason), cause_(cause) {}
  Cause cause() const { return cause_; }

 private:
  Cause cause_;
};

}  // namespace tal
