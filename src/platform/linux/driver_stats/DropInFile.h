#pragma once

#include <filesystem>
#include <string>
#include <string_view>
#include <variant>
#include <vector>

#include "core/Log.h"
#include "platform/DriverStatsFeed.h"

namespace tal {

/// A channel that a file of <config-dir>/drvstats.d describes.
struct DropInChannel {
  DriverStatsDescription description;
  std::string file;    ///< where its values are: an absolute path
  unsigned bits = 64;  ///< of its counters
};

/// What is wrong with a drop-in file, in words.
struct DropInMistake {
  std::string text;
};

/// The form is described in docs/drvstats.md. A file with any mistake gives no channels.
std::variant<std::vector<DropInChannel>, DropInMistake> parseDropIn(std::string_view text);

/// The channels of all files "*.json" of the directory, in the order of their names.
/// Each bad file is one line in the log, and left out. The directory may be missing.
std::vector<DropInChannel> loadDropIns(const std::filesystem::path& directory, const LogChannel& log);

}  // namespace tal
