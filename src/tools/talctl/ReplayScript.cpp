#include "tools/talctl/ReplayScript.h"

#include <algorithm>
#include <array>
#include <limits>
#include <string>

#include "tools/talctl/CommandFailure.h"
#include "tools/talctl/EventNames.h"
#include "tools/talctl/MessageBuilder.h"

namespace tal::talctl {
namespace {

struct OperationRow {
  std::string_view name;
  tal_operation operation;
  bool has_reporter;
  std::array<std::string_view, 4> further_keys = {};
};
constexpr OperationRow kOperations[] = {
    {"create", TAL_CREATE_SESSION, true},
    {"set_service", TAL_SET_SERVICE_TYPE, true, {"service"}},
    {"get_service", TAL_LOOK_UP_SERVICE_TYPE, true},
    {"configure", TAL_SET_CONFIGURATION, true, {"configuration"}},
    {"start", TAL_START_SESSION, true},
    {"send", TAL_SEND_MESSAGE, false, {"category", "type", "message", "reporters"}},
    {"stop", TAL_STOP_SESSION, true},
    {"destroy", TAL_DESTROY_SESSION, true},
    {"validate", TAL_LOOK_UP_REPORTER, true},
    {"list", TAL_LOOK_UP_ALL_REPORTERS, false},
    {"kill", TAL_KILL_SERVICE, false},
};

UsageError wrong(std::string_view key, std::string_view what) {
  return UsageError('"' + std::string(key) + "\" " + std::string(what));
}

const Json& require(const Json& line, const char* key) {
  const auto found = line.find(key);
  if (found == line.end()) throw wrong(key, "is missing");
  return *found;
}

std::int64_t reporterFrom(const char* key, const Json& value) {
  const bool too_large =
      value.is_number_unsigned() &&
      value.get<std::uint64_t>() > static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max());
  if (!value.is_number_integer() || too_large) throw wrong(key, "wants a signed 64-bit integer");
  return value.get<std::int64_t>();
}

/// A number or a name, as on the command line.
std::string vocabularyText(const Json& line, const char* key) {
  const Json& value = require(line, key);
  if (value.is_string()) return value.get<std::string>();
  if (value.is_number_unsigned()) return std::to_string(value.get<std::uint64_t>());
  throw wrong(key, "wants a number or a name");
}

std::chrono::milliseconds pauseFrom(const Json& line) {
  const auto found = line.find("after_ms");
  if (found == line.end()) return std::chrono::milliseconds(0);
  constexpr std::uint64_t kLongestMs = 24ULL * 3600 * 1000;
  if (!found->is_number_unsigned() || found->get<std::uint64_t>() > kLongestMs) {
    throw wrong("after_ms", "wants milliseconds, at most a day of them");
  }
  return std::chrono::milliseconds(found->get<std::int64_t>());
}

const OperationRow& operationOf(const Json& line) {
  const Json& name = require(line, "op");
  const auto* const row = std::find_if(std::begin(kOperations), std::end(kOperations),
                                       [&](const OperationRow& candidate) { return name == candidate.name; });
  if (row == std::end(kOperations)) throw wrong("op", "names no operation");
  return *row;
}

void refuseUnknownKeys(const Json& line, const OperationRow& row) {
  for (const auto& [key, value] : line.items()) {
    const bool known =
        key == "op" || key == "after_ms" || (row.has_reporter && key == "reporter") ||
        std::find(row.further_keys.begin(), row.further_keys.end(), key) != row.further_keys.end();
    if (!known || key.empty()) throw wrong(key, "has no meaning for \"" + std::string(row.name) + '"');
  }
}

void readMessage(const Json& line, ReplayStep& step) {
  step.category = static_cast<std::uint32_t>(parseCategory(vocabularyText(line, "category")));
  step.type = static_cast<std::uint16_t>(parseType(vocabularyText(line, "type")));
  step.message = buildMessage(require(line, "message"));
  const auto reporters = line.find("reporters");
  if (reporters == line.end() || reporters->is_null()) return;
  if (!reporters->is_array()) throw wrong("reporters", "wants an array of integers");
  if (reporters->size() > TAL_MAX_REPORTERS) throw wrong("reporters", "names too many");
  for (const Json& reporter : *reporters) step.reporters.push_back(reporterFrom("reporters", reporter));
}

}  // namespace

std::optional<ReplayStep> parseReplayLine(std::string_view text) {
  const std::size_t begin = text.find_first_not_of(" \t\r");
  if (begin == std::string_view::npos || text[begin] == '#') return std::nullopt;

  const Json line = Json::parse(text, nullptr, false);
  if (line.is_discarded()) throw UsageError("not well-formed JSON");
  if (!line.is_object()) throw UsageError("not a JSON object");
  const OperationRow& row = operationOf(line);
  refuseUnknownKeys(line, row);

  ReplayStep step{
      .operation = row.operation, .pause_before = pauseFrom(line), .reporters = {}, .message = {}};
  if (row.has_reporter) step.reporter = reporterFrom("reporter", require(line, "reporter"));
  if (row.operation == TAL_SET_SERVICE_TYPE) {
    step.service_type = static_cast<std::uint16_t>(parseService(vocabularyText(line, "service")));
  } else if (row.operation == TAL_SET_CONFIGURATION) {
    const Json& configuration = require(line, "configuration");
    if (!configuration.is_null()) step.message = buildMessage(configuration);
  } else if (row.operation == TAL_SEND_MESSAGE) {
    readMessage(line, step);
  }
  return step;
}

std::string_view replayOperationName(tal_operation operation) {
  const auto* const row =
      std::find_if(std::begin(kOperations), std::end(kOperations),
                   [&](const OperationRow& candidate) { return candidate.operation == operation; });
  return row == std::end(kOperations) ? "?" : row->name;
}

}  // namespace tal::talctl
