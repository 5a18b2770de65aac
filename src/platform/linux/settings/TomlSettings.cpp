#include "platform/linux/settings/TomlSettings.h"

#include <fcntl.h>
#include <sys/file.h>
#include <unistd.h>

#include <system_error>

#include "platform/linux/settings/AtomicFile.h"
#include "platform/linux/settings/TomlText.h"

namespace tal {

namespace {

using std::chrono_literals::operator""ms;

constexpr std::string_view kFolder = "settings";
// Files are looked at again after this: half of the second that is promised, as
// some callers keep an answer for the other half.
constexpr Clock::Instant kLookAgainAfter = 500ms;

// A domain names a file; it must not name one elsewhere.
bool isDomainName(std::string_view name) {
  return !name.empty() && name.front() != '.' && name.find('/') == std::string_view::npos &&
         name.find('\0') == std::string_view::npos;
}

std::filesystem::path fileOf(const std::filesystem::path& directory, std::string_view domain) {
  return directory / kFolder / (std::string(domain) + ".toml");
}

// Keeps other programs' changes to the directory's settings apart from ours,
// between reading a file and putting the changed one into its place.
class DirectoryLock {
 public:
  explicit DirectoryLock(const std::filesystem::path& directory)
      : file_(::open(directory.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC)) {
    if (file_ >= 0) ::flock(file_, LOCK_EX);
  }
  DirectoryLock(const DirectoryLock&) = delete;
  DirectoryLock& operator=(const DirectoryLock&) = delete;
  ~DirectoryLock() {
    if (file_ >= 0) ::close(file_);
  }

 private:
  int file_;
};

std::error_code makeFolder(const std::filesystem::path& folder) {
  namespace fs = std::filesystem;
  std::error_code error;
  if (!fs::create_directories(folder, error)) return error;
  fs::permissions(folder, fs::perms::owner_all | fs::perms::group_read | fs::perms::group_exec, error);
  return error;
}

}  // namespace

TomlSettings::Domain& TomlSettings::domainNamed(std::string_view name) const {
  auto found = domains_.find(name);
  if (found == domains_.end()) {
    Domain domain{TomlFile(fileOf(dependencies_.state_directory, name), dependencies_.log),
                  TomlFile(fileOf(dependencies_.config_directory, name), dependencies_.log),
                  {}};
    found = domains_.emplace(name, std::move(domain)).first;
  }
  return found->second;
}

std::optional<MessageValue> TomlSettings::value(std::string_view domain_name, std::string_view key) const {
  if (!isDomainName(domain_name)) return std::nullopt;
  const std::lock_guard lock(mutex_);
  Domain& domain = domainNamed(domain_name);
  const Clock::Instant now = dependencies_.clock.monotonic();
  if (!domain.looked_at || now - *domain.looked_at >= kLookAgainAfter) {
    domain.looked_at = now;
    domain.state.refresh();
    domain.config.refresh();
  }
  for (const TomlFile* layer : {&domain.state, &domain.config}) {
    // A copy of its own: callers on other threads may change what they were given.
    if (const MessageValue* found = layer->values().find(key)) return found->deepCopy();
  }
  return std::nullopt;
}

void TomlSettings::refresh(std::string_view domain_name) {
  if (!isDomainName(domain_name)) return;
  const std::lock_guard lock(mutex_);
  Domain& domain = domainNamed(domain_name);
  domain.state.readAnew();
  domain.config.readAnew();
  domain.looked_at = dependencies_.clock.monotonic();
}

bool TomlSettings::setValue(std::string_view domain_name, std::string_view key, const MessageValue& value) {
  if (!isDomainName(domain_name)) {
    TAL_LOG_ERROR(dependencies_.log, "a setting was not kept: \"", domain_name,
                  "\" names no settings domain");
    return false;
  }
  const std::lock_guard lock(mutex_);
  TomlFile& file = domainNamed(domain_name).state;
  if (const std::error_code error = makeFolder(file.path().parent_path())) {
    TAL_LOG_ERROR(dependencies_.log, "the setting ", key, " was not kept: cannot make ",
                  file.path().parent_path().string(), ": ", error.message());
    return false;
  }
  const DirectoryLock others(file.path().parent_path());
  file.refresh();
  return write(file, key, value);
}

bool TomlSettings::write(TomlFile& file, std::string_view key, const MessageValue& value) {
  const auto refuse = [&](const auto&... why) {
    TAL_LOG_ERROR(dependencies_.log, "the setting ", key, " was not kept in ", file.path().string(), ": ",
                  why...);
    return false;
  };
  if (file.isBroken()) return refuse("the file does not read and is left alone");
  MessageDict values = file.values();
  values.set(key, value);
  const auto text = tomlText(values);
  if (const auto* error = std::get_if<TomlError>(&text)) return refuse(error->reason);
  if (const std::error_code error = replaceFile(file.path(), std::get<std::string>(text)))
    return refuse(error.message());
  file.refresh();
  return true;
}

}  // namespace tal
