#include "tools/talctl/report/HtmlChart.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>
#include <string_view>

#include "tools/talctl/report/ReportHtml.h"
#include "tools/talctl/report/ReportWords.h"

namespace tal::talctl {
namespace {

constexpr double kMinute = 60;
constexpr double kHour = 3600;

/// The ends of a scale: the half of each can be written in few letters, too.
constexpr std::array kScaleEnds{2.0,         10.0,         20.0,         kMinute,      2 * kMinute,
                                4 * kMinute, 10 * kMinute, 20 * kMinute, 30 * kMinute, kHour,
                                2 * kHour,   4 * kHour,    6 * kHour,    8 * kHour,    12 * kHour,
                                24 * kHour,  48 * kHour,   100 * kHour,  200 * kHour,  400 * kHour};

double scaleEnd(double longest) {
  const auto* const end = std::lower_bound(kScaleEnds.begin(), kScaleEnds.end(), longest);
  if (end != kScaleEnds.end()) return *end;
  const double power = std::pow(10.0, std::floor(std::log10(longest / kHour)));
  return std::ceil(longest / kHour / power) * power * kHour;
}

std::string scaleText(double seconds) {
  if (seconds < kMinute) return std::to_string(std::lround(seconds)) + " s";
  if (seconds < kHour) return std::to_string(std::lround(seconds / kMinute)) + " min";
  return numberText(static_cast<std::uint64_t>(std::lround(seconds / kHour))) + " h";
}

std::string share(double part, double whole) {
  constexpr double kPercent = 100;
  std::array<char, 32> text{};
  std::snprintf(text.data(), text.size(), "%.2f%%", whole > 0 ? part / whole * kPercent : 0);
  return text.data();
}

std::string part(std::string_view of, std::string_view dimension, double seconds, double whole) {
  if (!(seconds > 0)) return {};
  return R"(<i class=")" + std::string(of) + R"(" style=")" + std::string(dimension) + ':' +
         share(seconds, whole) + R"("></i>)";
}

bool isTroubled(const Usage& usage) { return usage.overloads() > 0 || usage.errors > 0; }

std::string inWords(const ChartColumn& column) {
  std::string text = column.name + ": played " + durationText(column.usage.played_seconds);
  if (column.usage.recorded_seconds > 0) text += ", recorded " + durationText(column.usage.recorded_seconds);
  if (column.usage.overloads() > 0)
    text += ", " + countText(column.usage.overloads(), "overload", "overloads");
  if (column.usage.errors > 0) text += ", " + countText(column.usage.errors, "error", "errors");
  return text;
}

/// Which kinds of figures there are at all.
struct Contents {
  bool recorded = false;
  bool trouble = false;
};

std::string figures(const std::string& first_column, const std::vector<ChartColumn>& columns,
                    Contents contents) {
  std::string html = "<details><summary>Figures</summary><table><tr><th>" + first_column +
                     R"(</th><th class="right">Played</th>)";
  if (contents.recorded) html += R"(<th class="right">Recorded</th>)";
  if (contents.trouble) html += R"(<th class="right">Trouble</th>)";
  html += "</tr>";
  for (const ChartColumn& column : columns) {
    const Usage& usage = column.usage;
    if (!(usage.seconds() > 0) && !isTroubled(usage)) continue;
    html += "<tr><td>" + escapeHtml(column.name) + R"(</td><td class="right">)" +
            durationText(usage.played_seconds) + "</td>";
    if (contents.recorded) html += R"(<td class="right">)" + durationText(usage.recorded_seconds) + "</td>";
    if (contents.trouble) {
      html += R"(<td class="right">)" +
              (isTroubled(usage) ? numberText(usage.overloads() + usage.errors) : std::string("–")) + "</td>";
    }
    html += "</tr>\n";
  }
  return html + "</table></details>";
}

std::string legend(Contents contents) {
  if (!contents.recorded && !contents.trouble) return {};
  std::string html = R"(<figcaption class="legend"><span>played</span>)";
  if (contents.recorded) html += R"(<span class="is-rec">recorded</span>)";
  if (contents.trouble) html += R"(<span class="is-bad">overloads or errors</span>)";
  return html + "</figcaption>";
}

}  // namespace

std::string columnChart(const std::string& what, const std::string& first_column,
                        const std::vector<ChartColumn>& columns) {
  double longest = 0;
  Contents contents;
  for (const ChartColumn& column : columns) {
    longest = std::max(longest, column.usage.seconds());
    contents.recorded |= column.usage.recorded_seconds > 0;
    contents.trouble |= isTroubled(column.usage);
  }
  const double end = scaleEnd(longest);
  std::string html = R"(<figure><div class="plot" role="img" aria-label=")" + escapeHtml(what) + R"(">)";
  html += R"(<div class="line" style="bottom:100%"><span>)" + scaleText(end) + "</span></div>";
  html += R"(<div class="line" style="bottom:50%"><span>)" + scaleText(end / 2) + "</span></div>";
  html += R"(<div class="columns">)";
  std::string axis;
  for (const ChartColumn& column : columns) {
    html +=
        isTroubled(column.usage) ? R"(<div class="column marked" title=")" : R"(<div class="column" title=")";
    html += escapeHtml(inWords(column)) + R"(">)" +
            part("rec", "height", column.usage.recorded_seconds, end) +
            part("play", "height", column.usage.played_seconds, end) + "</div>\n";
    axis += column.label.empty() ? "<span></span>" : "<span><b>" + escapeHtml(column.label) + "</b></span>";
  }
  html += R"(</div></div><div class="axis" aria-hidden="true">)" + axis + "</div>";
  html += legend(contents);
  html += "</figure>" + figures(first_column, columns, contents);
  return html;
}

std::string bar(const Usage& usage, double longest) {
  return R"(<div class="bar" aria-hidden="true">)" + part("play", "width", usage.played_seconds, longest) +
         part("rec", "width", usage.recorded_seconds, longest) + "</div>";
}

}  // namespace tal::talctl
