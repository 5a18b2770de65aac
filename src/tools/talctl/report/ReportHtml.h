#pragma once

// A report as a page for a browser.

#include <string>
#include <string_view>

#include "tools/talctl/report/AudioReport.h"

namespace tal::talctl {

/// One page that holds everything it needs: it asks for nothing from anywhere and runs no script. It follows
/// the reader's choice of light or dark, and fits a phone.
std::string reportHtml(const AudioReport& report);

/// The text as it can stand between tags and in quoted attributes; control characters are shown as such.
std::string escapeHtml(std::string_view text);

}  // namespace tal::talctl
