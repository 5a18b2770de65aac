#include "tools/talctl/SettingsCommand.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <map>
#include <optional>
#include <string_view>
#include <system_error>
#include <variant>

#include "core/Log.h"
#include "core/MessageDict.h"
#include "core/MessageJson.h"
#include "platform/linux/process/LinuxClock.h"
#include "platform/linux/settings/TomlSettings.h"
#include "platform/linux/settings/TomlText.h"
#include "tools/talctl/ArgumentValue.h"
#include "tools/talctl/CommandFailure.h"

namespace tal::talctl {
namespace {

namespace fs = std::filesystem;

/// A domain names a file: it must not name one elsewhere.
void requireDomainName(const std::string& domain) {
  if (domain.empty() || domain.front() == '.' || domain.find('/') != std::string::npos) {
    throw UsageError("'" + domain + "' names no settings domain");
  }
}

/// The whole file; empty where there is none.
MessageDict readLayer(const fs::path& path) {
  std::ifstream file(path, std::ios::binary);
  if (!file) {
    if (errno == ENOENT) return {};
    throw CommandFailure("cannot read " + path.native() + ": " + std::generic_category().message(errno));
  }
  const std::string text((std::istreambuf_iterator<char>(file)), std::istreambuf_iterator<char>());
  auto parsed = parseToml(text);
  if (const auto* error = std::get_if<TomlError>(&parsed)) {
    throw CommandFailure(path.native() + ':' + std::to_string(error->line) + ':' +
                         std::to_string(error->column) + ": " + error->reason);
  }
  return std::get<MessageDict>(std::move(parsed));
}

std::string jsonText(const MessageValue& value) {
  std::string text;
  appendJson(text, value);
  return escapeControls(text);
}

struct Setting {
  MessageValue value;
  std::string_view layer;
};

/// By key, the state layer before the config layer, as the daemon looks them up.
std::map<std::string, Setting, std::less<>> settingsOf(const DaemonLocation& daemon,
                                                       const std::string& domain) {
  std::map<std::string, Setting, std::less<>> settings;
  const auto add = [&](const MessageDict& layer, std::string_view name) {
    for (const auto& [key, value] : layer) settings.try_emplace(std::string(key), Setting{value, name});
  };
  add(readLayer(daemon.stateSettingsPath(domain)), "state");
  add(readLayer(daemon.configSettingsPath(domain)), "config");
  return settings;
}

std::string settingJson(const std::string& key, const Setting& setting) {
  return R"({"key":)" + jsonText(MessageValue(key)) + R"(,"value":)" + jsonText(setting.value) +
         R"(,"layer":")" + std::string(setting.layer) + "\"}\n";
}

MessageValue valueFrom(const Json& json);

MessageValue arrayFrom(const Json& json) {
  MessageArray array;
  for (const Json& element : json) array.push_back(valueFrom(element));
  return array;
}

MessageValue dictFrom(const Json& json) {
  MessageDict dict;
  for (const auto& [key, value] : json.items()) dict.set(MessageKey(key), valueFrom(value));
  return dict;
}

MessageValue valueFrom(const Json& json) {
  switch (json.type()) {
    case Json::value_t::boolean:
      return json.get<bool>();
    case Json::value_t::number_integer:
      return json.get<std::int64_t>();
    case Json::value_t::number_unsigned:
      return json.get<std::uint64_t>();
    case Json::value_t::number_float:
      return json.get<double>();
    case Json::value_t::string:
      return json.get_ref<const std::string&>();
    case Json::value_t::array:
      return arrayFrom(json);
    case Json::value_t::object:
      return dictFrom(json);
    default:
      throw UsageError("null is no value of a setting");
  }
}

/// Keeps what the settings would log: the reason why one could not be kept.
class LastLine final : public LogSink {
 public:
  void write(std::string_view, LogLevel, std::string_view line) override {
    // The message stands behind the source file's name and line number.
    const std::size_t colon = line.find(':');
    const std::size_t text = line.find(' ', colon == std::string_view::npos ? 0 : colon);
    line_ = escapeControls(line.substr(text == std::string_view::npos ? 0 : text));
    line_.erase(0, line_.find_first_not_of(' '));
  }
  const std::string& line() const { return line_; }

 private:
  std::string line_;
};

/// From here on this process makes files as the owner of the directory, or of the nearest one above it: the
/// daemon could not read what root leaves to itself.
void actAsOwnerOf(fs::path directory) {
  if (geteuid() != 0) return;
  struct stat status {};
  while (stat(directory.c_str(), &status) != 0) {
    if (!directory.has_relative_path()) return;
    directory = directory.parent_path();
  }
  if (setegid(status.st_gid) != 0 || seteuid(status.st_uid) != 0) {
    throw CommandFailure("cannot act as the owner of " + directory.native() + ": " +
                         std::generic_category().message(errno));
  }
}

}  // namespace

void runSettingsGet(const DaemonLocation& daemon, const std::string& domain, const std::string& key,
                    bool json, const Terminal& terminal) {
  requireDomainName(domain);
  const auto settings = settingsOf(daemon, domain);
  if (key.empty()) {
    Table table({"KEY", "VALUE", "LAYER"});
    std::string lines;
    for (const auto& [name, setting] : settings) {
      table.addRow({name, jsonText(setting.value), std::string(setting.layer)});
      lines += settingJson(name, setting);
    }
    return terminal.write(json ? lines : table.text(terminal.width()));
  }
  const auto found = settings.find(key);
  if (found == settings.end()) throw CommandFailure(key + " is not set in " + domain);
  const MessageValue& value = found->second.value;
  if (json) return terminal.write(settingJson(key, found->second));
  terminal.write((value.isString() ? escapeControls(value.string()) : jsonText(value)) + '\n');
}

void runSettingsSet(const DaemonLocation& daemon, const std::string& domain, const std::string& key,
                    const std::string& value) {
  requireDomainName(domain);
  if (key.empty()) throw UsageError("a setting needs a key");
  const MessageValue parsed = valueFrom(parseValue(value));

  const fs::path folder = daemon.stateSettingsPath(domain).parent_path();
  actAsOwnerOf(folder);
  const LinuxClock clock;
  LastLine why;
  const LogChannel log("talctl", &why, LogLevel::kError);
  TomlSettings settings(
      {.config_directory = {}, .state_directory = folder.parent_path(), .clock = clock, .log = log});
  if (!settings.setValue(domain, key, parsed)) throw CommandFailure(why.line());
}

}  // namespace tal::talctl
