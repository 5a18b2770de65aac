#include "platform/linux/driver_stats/DropInFile.h"

#include <algorithm>
#include <array>
#include <initializer_list>
#include <iterator>
#include <map>
#include <nlohmann/json.hpp>
#include <optional>
#include <system_error>

#include "platform/linux/driver_stats/HostFiles.h"

namespace tal {

namespace {

using Json = nlohmann::json;

// All are read on the reporting queue when a session starts.
constexpr std::size_t kMostFiles = 64;
constexpr std::size_t kMostChannels = 256;  // of one file
constexpr unsigned kMostBits = 64;

const std::map<std::string_view, DriverStatsFormat> kFormats{{"simple", DriverStatsFormat::kSimple},
                                                             {"state", DriverStatsFormat::kState},
                                                             {"histogram", DriverStatsFormat::kHistogram}};

// Throws DropInMistake.
void checkKeys(const Json& object, std::initializer_list<std::string_view> known, const std::string& where) {
  if (!object.is_object()) throw DropInMistake{where + " is not an object"};
  for (const auto& [key, value] : object.items()) {
    if (std::find(known.begin(), known.end(), key) == known.end()) {
      std::string text = where;
      text.append(" has an unknown key \"").append(key).append("\"");
      throw DropInMistake{text};
    }
  }
}

// Throws DropInMistake.
std::optional<std::string> textOf(const Json& object, const char* key, const std::string& where) {
  const auto found = object.find(key);
  if (found == object.end()) return std::nullopt;
  if (!found->is_string() || found->get_ref<const std::string&>().empty()) {
    throw DropInMistake{where + ": \"" + key + "\" is not a text"};
  }
  return found->get<std::string>();
}

std::string requiredTextOf(const Json& object, const char* key, const std::string& where) {
  const auto text = textOf(object, key, where);
  if (!text) throw DropInMistake{where + " has no \"" + key + '"'};
  return *text;
}

unsigned bitsOf(const Json& object, const std::string& where) {
  const auto found = object.find("bits");
  if (found == object.end()) return kMostBits;
  if (!found->is_number_unsigned() || *found < 1U || *found > kMostBits) {
    throw DropInMistake{where + ": \"bits\" is not a number from 1 to 64"};
  }
  return found->get<unsigned>();
}

DropInChannel channelOf(const Json& object, DriverStatsDescription description, const std::string& where) {
  checkKeys(object, {"name", "file", "format", "unit", "bits"}, where);
  description.channel_name = requiredTextOf(object, "name", where);
  description.unit_label = textOf(object, "unit", where);
  const auto format = kFormats.find(requiredTextOf(object, "format", where));
  if (format == kFormats.end()) {
    throw DropInMistake{where + ": \"format\" is none of simple, state, histogram"};
  }
  description.format = format->second;
  std::string file = requiredTextOf(object, "file", where);
  if (file.front() != '/') throw DropInMistake{where + ": \"file\" is not an absolute path"};
  return {std::move(description), std::move(file), bitsOf(object, where)};
}

std::vector<DropInChannel> channelsOf(const Json& file) {
  checkKeys(file, {"group", "subgroup", "driver", "channels"}, "the file");
  const DriverStatsDescription description{.driver_name = textOf(file, "driver", "the file"),
                                           .group = textOf(file, "group", "the file"),
                                           .subgroup = textOf(file, "subgroup", "the file")};
  if (!description.group && !description.subgroup) {
    throw DropInMistake{R"(the file has neither "group" nor "subgroup")"};
  }
  const auto list = file.find("channels");
  if (list == file.end() || !list->is_array() || list->empty() || list->size() > kMostChannels) {
    throw DropInMistake{"\"channels\" is not a list of 1 to " + std::to_string(kMostChannels) + " channels"};
  }
  std::vector<DropInChannel> channels;
  for (const Json& object : *list) {
    const std::string where = "channel " + std::to_string(channels.size() + 1);
    channels.push_back(channelOf(object, description, where));
  }
  return channels;
}

std::variant<std::vector<DropInChannel>, DropInMistake> readDropIn(const HostFiles& files,
                                                                   const std::string& name) {
  const HostFiles::Content content = files.read('/' + name);
  if (content.ok()) return parseDropIn(content.text);
  return DropInMistake{"cannot be read: " + std::generic_category().message(content.error)};
}

}  // namespace

std::variant<std::vector<DropInChannel>, DropInMistake> parseDropIn(std::string_view text) {
  try {
    return channelsOf(Json::parse(text));
  } catch (const DropInMistake& mistake) {
    return mistake;
  } catch (const Json::exception& error) {
    // Behind the library's own name of the error, in brackets.
    const std::string_view reason = error.what();
    return DropInMistake{std::string(reason.substr(reason.find("] ") + 2))};
  }
}

std::vector<DropInChannel> loadDropIns(const std::filesystem::path& directory, const LogChannel& log) {
  const HostFiles files(directory);
  std::vector<DropInChannel> channels;
  std::size_t count = 0;
  for (const std::string& name : files.namesIn("/")) {
    if (name.starts_with('.') || !name.ends_with(".json")) continue;
    const std::string path = (directory / name).string();
    if (++count > kMostFiles) {
      TAL_LOG_ERROR(log, path, " and those behind it are ignored: more than ", kMostFiles, " files");
      break;
    }
    auto read = readDropIn(files, name);
    if (const auto* mistake = std::get_if<DropInMistake>(&read)) {
      TAL_LOG_ERROR(log, path, " is ignored: ", mistake->text);
      continue;
    }
    auto& found = std::get<std::vector<DropInChannel>>(read);
    std::move(found.begin(), found.end(), std::back_inserter(channels));
  }
  return channels;
}

}  // namespace tal
