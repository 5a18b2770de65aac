#pragma once

// Charts of a page, drawn with nothing but boxes: they need no script, follow the page's colours, and keep
// the size of their letters on any screen.

#include <string>
#include <vector>

#include "tools/talctl/report/Usage.h"

namespace tal::talctl {

struct ChartColumn {
  std::string name;   ///< In full, for the pointer and for the figures below.
  std::string label;  ///< Below the column; "" for none.
  Usage usage;
};

/// Columns of time over a common scale, recording on top of playing, and a mark below where there was
/// trouble. `what` says what is drawn, to who cannot see it; `first_column` heads the names in the table of
/// figures.
std::string columnChart(const std::string& what, const std::string& first_column,
                        const std::vector<ChartColumn>& columns);

/// A bar whose parts are shares of `longest`.
std::string bar(const Usage& usage, double longest);

}  // namespace tal::talctl
