#include "platform/linux/kite/KiteReport.h"

#include <string_view>

#include "core/DateText.h"
#include "core/MessageJson.h"

namespace tal {

namespace {

constexpr unsigned char kDelete = 0x7F;

// A program chooses its own name: it must not reach beyond its place in the text.
std::string asCode(std::string_view text) {
  std::string code = "`";
  for (const char character : text) {
    const auto byte = static_cast<unsigned char>(character);
    code += character == '`' || character == '|' || byte < ' ' || byte == kDelete ? '_' : character;
  }
  return code + '`';
}

void appendRow(std::string& out, std::string_view name, std::string_view value) {
  out += "| ";
  out += name;
  out += " | ";
  out += value;
  out += " |\n";
}

}  // namespace

std::string kiteReportAsJson(const KiteReport& report) {
  const KiteDraft& draft = report.draft;
  MessageArray diagnostics;
  for (const auto& each : draft.diagnostic_extension_identifiers) diagnostics.emplace_back(each);
  MessageDict json{{"title", draft.title},
                   {"problem_description", draft.problem_description},
                   {"component", MessageDict{{"name", draft.component.name},
                                             {"version", draft.component.version},
                                             {"identifier", draft.component.identifier}}},
                   {"reproducibility", draft.reproducibility},
                   {"classification", draft.classification},
                   {"diagnostic_extension_identifiers", std::move(diagnostics)},
                   {"display_reason", report.display_reason},
                   {"created_at", MessageDate{report.created_at}},
                   {"system", report.system},
                   {"program", report.program}};
  if (report.process_name) json.set("process_name", *report.process_name);
  std::string text;
  appendJson(text, json);
  return text + '\n';
}

std::string kiteReportAsMarkdown(const KiteReport& report) {
  const KiteDraft& draft = report.draft;
  const KiteComponent& component = draft.component;
  std::string time;
  appendRfc3339(time, report.created_at);
  std::string text = "# " + draft.title + "\n\n" + draft.problem_description + "\n\n| | |\n|---|---|\n";
  appendRow(
      text, "Component",
      component.name + ", version " + component.version + " (" + std::to_string(component.identifier) + ')');
  appendRow(text, "Reproducibility", std::to_string(draft.reproducibility));
  appendRow(text, "Classification", std::to_string(draft.classification));
  appendRow(text, "Program", report.process_name ? asCode(*report.process_name) : "unknown");
  appendRow(text, "Reason", report.display_reason);
  appendRow(text, "Time", time);
  appendRow(text, "System", report.system);
  appendRow(text, "Reported by", report.program);
  appendRow(text, "Draft", asCode(report.name));
  text += "\nTo be attached:";
  for (const auto& each : draft.diagnostic_extension_identifiers) text += ' ' + asCode(each);
  text += "; the newest files of " + asCode(report.log_directory + "/Reporting") + "\n";
  return text;
}

}  // namespace tal
