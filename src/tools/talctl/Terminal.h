#pragma once

// What standard output is, and so how to write to it.

#include <string>
#include <string_view>

#include "tools/talctl/TextLayout.h"

namespace tal::talctl {

enum class Style { kBold, kDim };

/// Where a command's results go. One thread.
class Terminal {
 public:
  /// Standard output. On a terminal: its width, and colours unless NO_COLOR is
  /// set or TERM is "dumb". Else unlimited lines without colours, so that other
  /// programs see everything.
  static Terminal standardOutput();

  Terminal(bool interactive, bool colours) : interactive_(interactive), colours_(colours) {}

  bool interactive() const { return interactive_; }

  /// The width at this moment: a window may be resized while events are followed.
  Width width() const;

  /// The text in a style, or as it is where there are no colours.
  std::string styled(Style style, std::string_view text) const;

  /// Writes all of it at once. Throws CommandFailure where that is impossible.
  void write(std::string_view text) const;

 private:
  bool interactive_;
  bool colours_;
};

}  // namespace tal::talctl
