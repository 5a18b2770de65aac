#include "tools/talctl/CapturesCommand.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdint>
#include <nlohmann/json.hpp>
#include <optional>
#include <string_view>
#include <system_error>
#include <vector>

#include "platform/linux/process/FileDescriptor.h"
#include "tools/talctl/CommandFailure.h"
#include "tools/talctl/TextLayout.h"

namespace tal::talctl {
namespace {

using nlohmann::json;

// Far above what the daemon writes.
constexpr std::size_t kMostFileBytes = std::size_t{64} << 20;

struct File {
  std::string name;
  std::uint64_t bytes;
};

// No links are followed: the directories belong to another user.
FileDescriptor openPlace(int parent, const std::string& name) {
  return FileDescriptor(openat(parent, name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
}

/// Names in the directory that are no drafts, in order.
std::vector<std::string> namesIn(const FileDescriptor& directory) {
  std::vector<std::string> names;
  const int own = openat(directory.get(), ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  DIR* stream = own < 0 ? nullptr : fdopendir(own);
  if (!stream) {
    if (own >= 0) close(own);
    return names;
  }
  while (const dirent* entry = readdir(stream)) {
    if (entry->d_name[0] != '.') names.emplace_back(entry->d_name);
  }
  closedir(stream);
  std::sort(names.begin(), names.end());
  return names;
}

std::vector<File> filesIn(const FileDescriptor& capture) {
  std::vector<File> files;
  for (std::string& name : namesIn(capture)) {
    struct stat status {};
    if (fstatat(capture.get(), name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) continue;
    if (S_ISREG(status.st_mode))
      files.push_back({std::move(name), static_cast<std::uint64_t>(status.st_size)});
  }
  return files;
}

std::optional<std::string> readFile(const FileDescriptor& capture, const std::string& name) {
  const FileDescriptor file(
      openat(capture.get(), name.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
  struct stat status {};
  if (!file || fstat(file.get(), &status) != 0 || !S_ISREG(status.st_mode)) return std::nullopt;
  std::string text;
  std::array<char, 65536> bytes{};
  while (text.size() < kMostFileBytes) {
    const ssize_t got = read(file.get(), bytes.data(), bytes.size());
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) return std::nullopt;
    if (got == 0) break;
    text.append(bytes.data(), static_cast<std::size_t>(got));
  }
  return text;
}

/// The directory of all captures; nothing where none was ever taken.
std::optional<FileDescriptor> openCaptures(const DaemonLocation& daemon) {
  const std::string path = daemon.capturesPath().native();
  FileDescriptor directory = openPlace(AT_FDCWD, path);
  if (directory) return directory;
  if (errno == ENOENT) return std::nullopt;
  throw CommandFailure("cannot read " + path + ": " + std::generic_category().message(errno));
}

/// What the capture says of itself; an empty object where that is not readable.
json signatureOf(const FileDescriptor& capture) {
  json signature = json::parse(readFile(capture, "signature.json").value_or(""), nullptr, false);
  return signature.is_object() ? signature : json::object();
}

std::string textIn(const json& object, const char* key) {
  const auto found = object.find(key);
  return found != object.end() && found->is_string() ? found->get<std::string>() : "";
}

std::string sizeText(std::uint64_t bytes) { return std::to_string((bytes + 1023) / 1024) + " KiB"; }

std::string escapedLines(std::string_view text) {
  std::string out;
  while (!text.empty()) {
    const std::string_view line = text.substr(0, text.find('\n'));
    out += escapeControls(line);
    out += '\n';
    text.remove_prefix(std::min(line.size() + 1, text.size()));
  }
  return out;
}

// JSON for eyes; what does not parse as it is.
std::string readable(const File& file, const std::string& text) {
  if (file.name.ends_with(".json")) {
    const json parsed = json::parse(text, nullptr, false);
    if (!parsed.is_discarded()) return escapedLines(parsed.dump(2) + '\n');
  }
  return escapedLines(text);
}

/// In the order of reading: what it is about, then what the machine did.
int placeOf(const File& file) {
  constexpr std::array<std::string_view, 8> kOrder{"signature.json", "payload.json",  "messages.jsonl",
                                                   "processes.txt",  "scheduler.txt", "system.txt",
                                                   "log.txt",        "trace.txt"};
  return static_cast<int>(std::find(kOrder.begin(), kOrder.end(), file.name) - kOrder.begin());
}

}  // namespace

void runCaptures(const DaemonLocation& daemon, bool as_json, const Terminal& terminal) {
  Table table({"CAPTURE", "KIND", "FAULT", "SIZE"});
  std::string lines;
  const auto captures = openCaptures(daemon);
  for (const std::string& name : captures ? namesIn(*captures) : std::vector<std::string>()) {
    const FileDescriptor capture = openPlace(captures->get(), name);
    if (!capture) continue;
    std::uint64_t bytes = 0;
    for (const File& file : filesIn(capture)) bytes += file.bytes;
    json told = signatureOf(capture);
    if (as_json) {
      told["identifier"] = name;
      told["bytes"] = bytes;
      lines += escapeControls(told.dump(-1, ' ', false, json::error_handler_t::replace)) + '\n';
      continue;
    }
    const json signature = told.value("signature", json::object());
    const std::string context = signature.is_object() ? textIn(signature, "subtypeContext") : "";
    std::string fault = signature.is_object() ? textIn(signature, "type") : "";
    if (!context.empty()) fault += ' ' + context;
    table.addRow({name, textIn(told, "kind"), fault, sizeText(bytes)});
  }
  terminal.write(as_json ? lines : table.text(terminal.width()));
}

void runCapturesShow(const DaemonLocation& daemon, const std::string& identifier, const std::string& file,
                     const Terminal& terminal) {
  const auto plain = [](const std::string& name) {
    return !name.empty() && name.front() != '.' && name.find('/') == std::string::npos;
  };
  const auto captures = openCaptures(daemon);
  FileDescriptor capture;
  if (captures && plain(identifier)) capture = openPlace(captures->get(), identifier);
  if (!capture) throw CommandFailure("no capture is called '" + identifier + "'");
  if (!file.empty()) {
    const auto text = plain(file) ? readFile(capture, file) : std::nullopt;
    if (!text) throw CommandFailure("the capture has no file '" + file + "'");
    terminal.write(terminal.interactive() ? escapedLines(*text) : *text);
    return;
  }
  std::vector<File> files = filesIn(capture);
  std::stable_sort(files.begin(), files.end(),
                   [](const File& a, const File& b) { return placeOf(a) < placeOf(b); });
  std::string out;
  for (const File& each : files) {
    out += terminal.styled(Style::kBold, "==== " + escapeControls(each.name));
    out += '\n';
    if (each.name == "trace.txt") {
      out += sizeText(each.bytes) + ": --file trace.txt prints it\n\n";
      continue;
    }
    out += readable(each, readFile(capture, each.name).value_or("not readable\n")) + '\n';
  }
  terminal.write(out);
}

}  // namespace tal::talctl
