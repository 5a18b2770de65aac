#pragma once

// How a report's page looks.

#include <string_view>

namespace tal::talctl {

/// The style sheet of the classes that ReportHtml.cpp uses.
extern const std::string_view kReportStyle;

}  // namespace tal::talctl
