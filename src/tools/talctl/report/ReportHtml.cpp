#include "tools/talctl/report/ReportHtml.h"

#include <algorithm>
#include <functional>
#include <vector>

#include "core/TalReportingUtility.h"
#include "tools/talctl/TextLayout.h"
#include "tools/talctl/report/HtmlChart.h"
#include "tools/talctl/report/ReportStyle.h"
#include "tools/talctl/report/ReportWords.h"

namespace tal::talctl {
namespace {

/// A section, or nothing where there is nothing in it.
std::string section(std::string_view title, const std::string& content) {
  if (content.empty()) return {};
  return "<section><h2>" + std::string(title) + "</h2>\n" + content + "</section>\n";
}

std::string tile(std::string_view name, const std::string& value, std::string_view colour = {}) {
  return "<div><dt>" + std::string(name) + R"(</dt><dd class=")" + std::string(colour) + R"(">)" + value +
         "</dd></div>\n";
}

std::string troubleTile(std::string_view name, std::uint64_t count) {
  return tile(name, count == 0 ? "none" : numberText(count), count == 0 ? "good" : "bad");
}

std::string tiles(const AudioReport& report) {
  const std::size_t applications = report.applications.rows.size() + report.applications.other_count;
  std::string html = R"(<dl class="tiles">)" + tile("Played", durationText(report.total.played_seconds)) +
                     tile("Recorded", durationText(report.total.recorded_seconds));
  if (report.total.played_seconds > 0) html += tile("Mean volume", percentText(report.total.meanVolume()));
  html += tile("Applications", numberText(applications));
  html += troubleTile("Overloads", report.total.overloads());
  html += troubleTile("Errors", report.total.errors);
  return html + "</dl>\n";
}

std::string coloured(std::string_view colour, const std::string& text) {
  return R"(<span class=")" + std::string(colour) + R"(">)" + text + "</span>";
}

/// Facts beside one another; a line breaks between them only.
std::string facts(const std::vector<std::string>& all) {
  std::string html = R"(<div class="detail">)";
  for (const std::string& fact : all) {
    html += (&fact == &all.front() ? "<span>" : " · <span>") + fact + "</span>";
  }
  return html + "</div>";
}

/// What there is to say of a usage beside its length.
std::string detail(const std::string& service, const Usage& usage) {
  std::vector<std::string> all;
  if (!service.empty()) all.push_back(escapeHtml(service));
  if (usage.recorded_seconds > 0) {
    if (usage.played_seconds > 0) all.push_back("played " + durationText(usage.played_seconds));
    all.push_back("recorded " + durationText(usage.recorded_seconds));
  }
  if (usage.stretches > 0) all.push_back(countText(usage.stretches, "stretch", "stretches"));
  if (usage.played_seconds > 0) all.push_back("mean volume " + percentText(usage.meanVolume()));
  if (usage.overloads() > 0) {
    all.push_back(coloured("bad", countText(usage.overloads(), "overload", "overloads")));
  }
  if (usage.errors > 0) all.push_back(coloured("bad", countText(usage.errors, "error", "errors")));
  return facts(all);
}

std::string listItem(std::string_view kind, std::string_view name, const std::string& value,
                     const std::string& below) {
  return R"(<li class=")" + std::string(kind) + R"("><div class="head"><span class="name">)" +
         escapeHtml(name) + R"(</span><span class="value">)" + value + "</span></div>" + below + "</li>\n";
}

using SplitName = std::function<ApplicationName(const std::string&)>;

std::string rankedList(const Ranking& ranking, const SplitName& split) {
  if (ranking.rows.empty()) return {};
  const double longest = std::max(ranking.rows.front().usage.seconds(), ranking.others.seconds());
  const auto item = [&](std::string_view kind, const ApplicationName& name, const Usage& usage) {
    return listItem(kind, name.application, durationText(usage.seconds()),
                    bar(usage, longest) + detail(name.service, usage));
  };
  std::string html = R"(<ol class="ranks">)";
  for (const auto& row : ranking.rows) html += item("", split(row.name), row.usage);
  if (ranking.other_count > 0) {
    html += item("others", {countText(ranking.other_count, "other", "others"), ""}, ranking.others);
  }
  return html + "</ol>\n";
}

std::string nameList(const Ranking& ranking) {
  return rankedList(ranking, [](const std::string& name) { return ApplicationName{name, ""}; });
}

std::string volumes(const AudioReport& report) {
  if (!(report.total.played_seconds > 0)) return {};
  constexpr std::size_t kColumnsPerLabel = 4;
  std::vector<ChartColumn> columns;
  for (std::size_t i = 0; i < report.volumes.size(); ++i) {
    const std::string volume = percentText(TalReportingUtilityBucketNumberToStringVolumes[i]);
    columns.push_back({.name = volume,
                       .label = i % kColumnsPerLabel == 0 ? volume : "",
                       .usage = {.played_seconds = report.volumes[i]}});
  }
  return R"(<p class="soft">Playing time at each volume</p>)" +
         columnChart("Playing time at each volume", "Volume", columns);
}

std::string days(const AudioReport& report) {
  if (report.days.empty()) return {};
  // As many as a phone has room for; the last day has one always.
  constexpr std::size_t kMostLabels = 5;
  const std::size_t per_label = (report.days.size() + kMostLabels - 1) / kMostLabels;
  std::vector<ChartColumn> columns;
  for (std::size_t i = 0; i < report.days.size(); ++i) {
    const auto& day = report.days[i];
    const bool labelled = (report.days.size() - 1 - i) % per_label == 0;
    columns.push_back({.name = dateText(day.date, kLongDate),
                       .label = labelled ? dateText(day.date, kShortDate) : "",
                       .usage = day.usage});
  }
  std::string html = columnChart("Playing and recording by day", "Day", columns);
  if (report.earlier.seconds() > 0) {
    html += R"(<p class="detail">On earlier days: )" + durationText(report.earlier.seconds()) + "</p>";
  }
  return html;
}

std::string hours(const AudioReport& report) {
  if (report.days.empty()) return {};
  constexpr std::size_t kHoursPerLabel = 6;
  std::vector<ChartColumn> columns;
  for (std::size_t hour = 0; hour < report.hours.size(); ++hour) {
    columns.push_back({.name = hourText(hour) + "–" + hourText(hour + 1),
                       .label = hour % kHoursPerLabel == 0 ? hourText(hour) : "",
                       .usage = report.hours[hour]});
  }
  return columnChart("Playing and recording by hour of the day", "Hour", columns);
}

std::string trouble(const AudioReport& report) {
  if (!report.hasTrouble()) return {};
  std::string html;
  if (report.total.overloads() > 0) {
    html += "<p>" + coloured("bad", countText(report.total.overloads(), "overload", "overloads"));
    if (report.total.starved_seconds > 0)
      html += ", " + durationText(report.total.starved_seconds) + " of audio missing";
    html += "</p>";
  }
  if (report.rows_given_up > 0) {
    html += "<p>" + coloured("bad", countText(report.rows_given_up, "row was", "rows were")) +
            " lost while the store could not be written</p>";
  }
  if (report.errors.empty()) return html;
  html += R"(<ol class="ranks">)";
  for (const auto& [kind, error] : report.errors) {
    std::vector<std::string> all{escapeHtml(kind.event), "last " + timeText(error.last_at)};
    if (!kind.application.empty()) all.insert(all.begin(), escapeHtml(kind.application));
    html += listItem("", kind.issue.empty() ? kind.event : kind.issue,
                     countText(error.count, "time", "times"), facts(all));
  }
  if (report.other_errors > 0) {
    html += listItem("others", "others", countText(report.other_errors, "time", "times"), "");
  }
  return html + "</ol>\n";
}

}  // namespace

std::string escapeHtml(std::string_view text) {
  std::string out;
  for (const char c : escapeControls(text)) {
    switch (c) {
      case '&':
        out += "&amp;";
        break;
      case '<':
        out += "&lt;";
        break;
      case '>':
        out += "&gt;";
        break;
      case '"':
        out += "&quot;";
        break;
      case '\'':
        out += "&#39;";
        break;
      default:
        out += c;
    }
  }
  return out;
}

std::string reportHtml(const AudioReport& report) {
  // The policy is a promise that the browser keeps: whatever a name might smuggle in, nothing is fetched or
  // run.
  std::string html =
      "<!doctype html>\n<html lang=\"en\">\n<head>\n<meta charset=\"utf-8\">\n"
      R"(<meta http-equiv="Content-Security-Policy" content="default-src 'none'; style-src 'unsafe-inline'; )"
      R"(base-uri 'none'; form-action 'none'">)"
      R"(<meta name="viewport" content="width=device-width, initial-scale=1">)"
      "<title>Audio report</title>\n<style>";
  html += kReportStyle;
  html += "</style>\n</head>\n<body>\n<header><h1>Audio report</h1>\n<p>" + escapeHtml(periodText(report)) +
          "</p></header>\n";
  html += tiles(report);
  if (const std::string emptiness = emptinessText(report); !emptiness.empty()) {
    html += "<section><p>" + escapeHtml(emptiness) + "</p></section>\n";
  }
  html += "<main>\n<div class=\"stack\">\n" +
          section("Applications", rankedList(report.applications, ReportTally::applicationOf)) +
          section("Devices", nameList(report.devices)) + "</div>\n<div class=\"stack\">\n" +
          section("How loud", volumes(report)) + section("By day", days(report)) +
          section("By hour of the day", hours(report)) + section("Trouble", trouble(report)) +
          section("Formats", nameList(report.formats)) + "</div>\n</main>\n";
  html += "<footer>" + escapeHtml(originText(report)) + "</footer>\n</body>\n</html>\n";
  return html;
}

}  // namespace tal::talctl
