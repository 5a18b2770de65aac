#pragma once

// The directory that holds the captures, each a directory of plain files.

#include <cstdint>
#include <filesystem>
#include <memory>
#include <string>
#include <string_view>
#include <system_error>
#include <vector>

#include "platform/linux/process/FileDescriptor.h"

namespace tal {

/// A capture that is being written, under a temporary name. One thread.
class CaptureDraft {
 public:
  /// `directory` is the draft's own, within `archive` under `temporary_name`.
  CaptureDraft(FileDescriptor archive, FileDescriptor directory, std::string temporary_name,
               std::string final_name);
  CaptureDraft(const CaptureDraft&) = delete;
  CaptureDraft& operator=(const CaptureDraft&) = delete;
  /// Removes what was not finished.
  ~CaptureDraft();

  /// One whole file, durably. After a failure the rest does nothing.
  void write(const std::string& name, std::string_view text);

  /// Moves the capture into its place, or tells what failed; then it is removed.
  std::error_code finish();

 private:
  FileDescriptor archive_;
  FileDescriptor directory_;
  std::string temporary_name_;
  std::string final_name_;
  std::error_code error_;
  bool finished_ = false;
};

/// `<log-dir>/Audio/Captures`. One thread. Everything in it belongs to the daemon's
/// user and can be read by its group alone. No link in it is followed, and what is
/// not named like a capture is left alone.
///
/// A name appears when its capture is whole, and disappears before anything of it
/// is taken away: kill -9 and a full disk leave at most a draft, which
/// `removeDrafts` finds.
class CaptureArchive {
 public:
  explicit CaptureArchive(std::filesystem::path log_directory) : log_directory_(std::move(log_directory)) {}

  /// Null, with the reason in `error`, when nothing can be written there.
  std::unique_ptr<CaptureDraft> begin(const std::string& name, std::error_code& error) const;

  /// What an earlier process did not finish.
  void removeDrafts() const;

  /// Removes the oldest captures until they hold at most so many bytes; answers
  /// the names of those removed. A capture's name begins with its time.
  std::vector<std::string> keepWithin(std::uint64_t bytes) const;

 private:
  FileDescriptor open(bool create, std::error_code& error) const;

  const std::filesystem::path log_directory_;
};

}  // namespace tal
