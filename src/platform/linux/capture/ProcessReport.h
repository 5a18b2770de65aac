#pragma once

// What processes were doing, for a person to read.

#include <cstdint>
#include <filesystem>
#include <string>
#include <vector>

namespace tal {

/// For each process: command, state, memory, number of open files, and its threads
/// with the place in the kernel where each waits and, where readable, its kernel
/// stack. A process that is not there, or ends while it is read, is left out. What
/// the text takes is bounded: it says how many processes or threads it leaves out.
std::string processReport(const std::vector<std::int32_t>& process_identifiers,
                          const std::filesystem::path& proc = "/proc");

/// One line for each process of the machine.
std::string processTable(const std::filesystem::path& proc = "/proc");

/// One line for each thread of the machine that runs, waits for the disk or a
/// lock of the kernel, or is scheduled in real time.
std::string busyThreads(const std::filesystem::path& proc = "/proc");

}  // namespace tal
