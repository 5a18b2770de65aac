#pragma once

#include <functional>
#include <map>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "platform/CommandShell.h"

namespace tal::test {

/// Knows what each command line writes; the others cannot be run.
class FakeCommandShell final : public CommandShell {
 public:
  bool run(const std::string& command_line, const Output& output) override {
    {
      const std::lock_guard lock(mutex_);
      ran.push_back(command_line);
    }
    if (while_running) while_running();
    const auto found = outputs.find(command_line);
    if (found == outputs.end()) return false;
    // In pieces that know nothing of lines.
    constexpr std::size_t kPieceBytes = 7;
    for (std::string_view rest = found->second; !rest.empty();
         rest.remove_prefix(std::min(kPieceBytes, rest.size())))
      output(rest.substr(0, kPieceBytes));
    return true;
  }

  std::map<std::string, std::string> outputs;
  /// Called on the thread of each run.
  std::function<void()> while_running;
  std::vector<std::string> ran;

 private:
  std::mutex mutex_;
};

}  // namespace tal::test
