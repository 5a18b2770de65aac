#include "tools/talctl/report/ReportText.h"

#include <algorithm>
#include <cmath>
#include <vector>

#include "core/TalReportingUtility.h"
#include "tools/talctl/report/ReportWords.h"

namespace tal::talctl {
namespace {

constexpr std::size_t kBarColumns = 20;
// What a table takes beside its bars; on narrower terminals there are none. Applications have most figures.
constexpr std::size_t kColumnsForBars = 72;
constexpr std::size_t kColumnsForBarsOfApplications = 110;
// Below this, names would have no room beside all the figures.
constexpr std::size_t kColumnsForAll = 70;
// Prose without a terminal is for people all the same.
constexpr std::size_t kProseColumns = 100;

/// The parts of the text, one below the other.
class Writer {
 public:
  explicit Writer(const Terminal& terminal) : terminal_(terminal), width_(terminal.width()) {}

  bool has(std::size_t columns) const { return !width_ || *width_ >= columns; }

  void heading(std::string_view text) {
    if (!text_.empty()) text_ += '\n';
    text_ += terminal_.styled(Style::kBold, text) + '\n';
  }

  void gap() { text_ += '\n'; }

  void table(const Table& table) { text_ += table.text(width_); }

  void prose(const std::string& text) {
    std::vector<std::string> words;
    std::size_t begin = 0;
    while (begin < text.size()) {
      const std::size_t end = std::min(text.find(' ', begin), text.size());
      words.push_back(text.substr(begin, end - begin));
      begin = end + 1;
    }
    for (const std::string& line : wrapWords(words, width_.value_or(kProseColumns))) text_ += line + '\n';
  }

  std::string take() { return std::move(text_); }

 private:
  const Terminal& terminal_;
  Width width_;
  std::string text_;
};

/// As long as its part of the longest; at least a sliver for anything at all.
std::string bar(double seconds, double longest) {
  constexpr std::string_view kFull = "█";
  constexpr std::string_view kSliver = "▏";
  if (!(seconds > 0)) return "";
  std::string text;
  const auto cells = std::lround(seconds / longest * static_cast<double>(kBarColumns));
  for (long i = 0; i < cells; ++i) text += kFull;
  return text.empty() ? std::string(kSliver) : text;
}

std::string count(std::uint64_t number) { return number == 0 ? "–" : numberText(number); }

/// What a table says beside who or when. Columns in which nobody has anything are left out.
struct Columns {
  bool service = false;
  bool volume = false;
  bool recorded = false;
  bool overloads = false;
  bool errors = false;
  bool bars = false;
};

/// A table of which each row is somebody's or some time's usage.
class UsageTable {
 public:
  UsageTable(std::vector<std::string> names, Columns columns)
      : columns_(columns), table_(heading(std::move(names))) {}

  void add(std::vector<std::string> cells, const Usage& usage, double longest) {
    cells.push_back(durationText(usage.played_seconds));
    if (columns_.recorded) cells.push_back(durationText(usage.recorded_seconds));
    if (columns_.volume) cells.push_back(usage.played_seconds > 0 ? percentText(usage.meanVolume()) : "–");
    if (columns_.overloads) cells.push_back(count(usage.overloads()));
    if (columns_.errors) cells.push_back(count(usage.errors));
    if (columns_.bars) cells.push_back(bar(usage.seconds(), longest));
    table_.addRow(cells);
  }

  const Table& table() const { return table_; }

 private:
  Table heading(std::vector<std::string> names) const {
    const std::size_t first_number = names.size();
    names.emplace_back("PLAYED");
    if (columns_.recorded) names.emplace_back("RECORDED");
    if (columns_.volume) names.emplace_back("VOLUME");
    if (columns_.overloads) names.emplace_back("OVERLOADS");
    if (columns_.errors) names.emplace_back("ERRORS");
    const std::size_t end = names.size();
    if (columns_.bars) names.emplace_back("");
    Table table(std::move(names));
    for (std::size_t column = first_number; column < end; ++column) table.alignRight(column);
    return table;
  }

  Columns columns_;
  Table table_;
};

/// All there is to tell, or on a narrow terminal what matters most.
Columns columnsFor(const AudioReport& report, const Writer& writer) {
  const bool all = writer.has(kColumnsForAll);
  return {.service = all,
          .volume = all,
          .recorded = report.total.recorded_seconds > 0,
          .overloads = all && report.total.overloads() > 0,
          .errors = all && report.total.errors > 0,
          .bars = writer.has(kColumnsForBars)};
}

std::string othersText(const Ranking& ranking) {
  return ranking.other_count == 1 ? "others" : numberText(ranking.other_count) + " others";
}

/// The first row's: others together can be longer, and are shown as if they were as long.
double longestOf(const Ranking& ranking) {
  const double first = ranking.rows.empty() ? 0 : ranking.rows.front().usage.seconds();
  return std::max(first, ranking.others.seconds());
}

void writeApplications(Writer& writer, const AudioReport& report) {
  const Ranking& ranking = report.applications;
  if (ranking.rows.empty()) return;
  writer.heading("Applications");
  Columns columns = columnsFor(report, writer);
  columns.bars = writer.has(kColumnsForBarsOfApplications);
  std::vector<std::string> names{"APPLICATION"};
  if (columns.service) names.emplace_back("SERVICE");
  UsageTable table(std::move(names), columns);
  const double longest = longestOf(ranking);
  const auto add = [&](const std::string& application, const std::string& service, const Usage& usage) {
    std::vector<std::string> cells{application};
    if (columns.service) cells.push_back(service);
    table.add(std::move(cells), usage, longest);
  };
  for (const auto& row : ranking.rows) {
    const ApplicationName name = ReportTally::applicationOf(row.name);
    add(name.application, name.service.empty() ? "–" : name.service, row.usage);
  }
  if (ranking.other_count > 0) add(othersText(ranking), "", ranking.others);
  writer.table(table.table());
}

void writeNames(Writer& writer, std::string_view title, const std::string& column, const Ranking& ranking,
                Columns columns) {
  if (ranking.rows.empty()) return;
  writer.heading(title);
  columns.overloads = false;
  columns.errors = false;
  UsageTable table({column}, columns);
  const double longest = longestOf(ranking);
  for (const auto& row : ranking.rows) table.add({row.name}, row.usage, longest);
  if (ranking.other_count > 0) table.add({othersText(ranking)}, ranking.others, longest);
  writer.table(table.table());
}

void writeVolumes(Writer& writer, const AudioReport& report) {
  if (!(report.total.played_seconds > 0)) return;
  writer.heading("How loud");
  const bool bars = writer.has(kColumnsForBars);
  std::vector<std::string> names{"VOLUME", "PLAYED", "SHARE"};
  if (bars) names.emplace_back("");
  Table table(std::move(names));
  for (std::size_t i = 0; i < 3; ++i) table.alignRight(i);
  const double longest = *std::max_element(report.volumes.begin(), report.volumes.end());
  for (std::size_t i = 0; i < report.volumes.size(); ++i) {
    const double seconds = report.volumes[i];
    if (!(seconds > 0)) continue;
    std::vector<std::string> cells{percentText(TalReportingUtilityBucketNumberToStringVolumes[i]),
                                   durationText(seconds), shareText(seconds / report.total.played_seconds)};
    if (bars) cells.push_back(bar(seconds, longest));
    table.addRow(cells);
  }
  writer.table(table);
}

template <typename Usages>
double longestUsage(const Usages& usages) {
  double longest = 0;
  for (const auto& usage : usages) longest = std::max(longest, usage.seconds());
  return longest;
}

void writeTimes(Writer& writer, const AudioReport& report) {
  if (report.days.empty()) return;
  writer.heading("By day");
  Columns columns = columnsFor(report, writer);
  columns.volume = false;
  std::vector<Usage> days{report.earlier};
  for (const auto& day : report.days) days.push_back(day.usage);
  const double longest_day = longestUsage(days);
  UsageTable by_day({"DAY"}, columns);
  if (report.earlier.seconds() > 0) by_day.add({"earlier"}, report.earlier, longest_day);
  for (const auto& day : report.days) by_day.add({dateText(day.date, kLongDate)}, day.usage, longest_day);
  writer.table(by_day.table());

  writer.heading("By hour of the day");
  UsageTable by_hour({"HOUR"}, columns);
  const double longest_hour = longestUsage(report.hours);
  for (std::size_t hour = 0; hour < report.hours.size(); ++hour) {
    const Usage& usage = report.hours[hour];
    if (usage.seconds() == 0 && usage.overloads() == 0 && usage.errors == 0) continue;
    by_hour.add({hourText(hour)}, usage, longest_hour);
  }
  writer.table(by_hour.table());
}

void writeTrouble(Writer& writer, const AudioReport& report) {
  if (!report.hasTrouble()) return;
  writer.heading("Trouble");
  if (report.total.overloads() > 0) {
    std::string text = countText(report.total.overloads(), "overload", "overloads");
    if (report.total.starved_seconds > 0)
      text += ", " + durationText(report.total.starved_seconds) + " of audio missing";
    writer.prose(text + ".");
  }
  if (report.rows_given_up > 0) {
    writer.prose(countText(report.rows_given_up, "row was", "rows were") +
                 " lost while the store could not be written.");
  }
  if (report.errors.empty()) return;
  Table table({"ERROR", "ISSUE", "APPLICATION", "TIMES", "LAST"});
  table.alignRight(3);
  for (const auto& [kind, error] : report.errors) {
    table.addRow({kind.event, kind.issue.empty() ? "–" : kind.issue, kind.application,
                  numberText(error.count), timeText(error.last_at)});
  }
  if (report.other_errors > 0) table.addRow({"others", "", "", numberText(report.other_errors), ""});
  writer.table(table);
}

}  // namespace

std::string reportText(const AudioReport& report, const Terminal& terminal) {
  Writer writer(terminal);
  writer.heading("Audio report");
  writer.prose(periodText(report));
  if (const std::string emptiness = emptinessText(report); !emptiness.empty()) {
    writer.prose(emptiness);
  } else {
    writer.prose("Played " + durationText(report.total.played_seconds) + ", recorded " +
                 durationText(report.total.recorded_seconds) + ".");
  }
  writeApplications(writer, report);
  writeVolumes(writer, report);
  writeNames(writer, "Devices", "DEVICE", report.devices, columnsFor(report, writer));
  Columns of_formats = columnsFor(report, writer);
  of_formats.recorded = false;  // recordings do not tell theirs
  writeNames(writer, "Formats", "FORMAT", report.formats, of_formats);
  writeTimes(writer, report);
  writeTrouble(writer, report);
  writer.gap();
  writer.prose(originText(report));
  return writer.take();
}

}  // namespace tal::talctl
