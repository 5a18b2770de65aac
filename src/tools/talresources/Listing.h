#pragma once

// What `talresources` prints.

#include <filesystem>
#include <functional>
#include <optional>
#include <string>
#include <string_view>

#include "tools/talresources/ProcessResources.h"

namespace tal {

using WriteText = std::function<void(std::string_view)>;

/// The block of one process: a line with RESOURCE and its name, one for each
/// resource. The words and columns are what the readers of logs filter by.
std::string processBlock(const ProcessResources& resources);

/// A block for each process, handed over as soon as it is known: a process that
/// cannot be read without waiting keeps nothing back but what follows it.
void listProcesses(const std::filesystem::path& proc, const WriteText& write);

/// The kernel's memory zones: its slabs where this user may read them, else its
/// memory figures. The reason when there are neither.
std::optional<std::string> listZones(const std::filesystem::path& proc, const WriteText& write);

}  // namespace tal
