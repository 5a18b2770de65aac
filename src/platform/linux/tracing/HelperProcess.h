#pragma once

#include <sys/types.h>

#include <filesystem>
#include <functional>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

#include "platform/linux/process/FileDescriptor.h"

namespace tal {

/// A program that is spoken to line by line. One thread reads; any thread writes
/// and gives up.
class HelperProcess {
 public:
  HelperProcess();

  /// Empty on success, else why the program could not be started. Once.
  std::string spawn(const std::filesystem::path& program, const std::vector<std::string>& arguments);

  /// Hands over each line until the program closes its output, then waits for its
  /// end; a program that was given up and does not end is killed.
  void readLines(const std::function<void(std::string_view line)>& take);

  void writeLine(std::string_view line);
  /// Closes the program's input, which tells it to end.
  void giveUp();

 private:
  enum class Waited { kReadable, kGivenUp, kTimedOut };
  Waited waitReadable(bool given_up) const;
  void end(bool kill_it);

  FileDescriptor given_up_;  // an eventfd
  FileDescriptor output_;
  std::mutex input_mutex_;
  FileDescriptor input_;
  bool was_given_up_ = false;
  pid_t process_ = -1;
};

}  // namespace tal
