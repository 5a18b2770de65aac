#include "tools/talresources/Listing.h"

#include <fstream>
#include <sstream>

namespace tal {

namespace {

constexpr std::size_t kNameColumns = 16;
constexpr std::size_t kFirstColumns = 10;
constexpr std::size_t kColumns = 11;
constexpr unsigned char kDelete = 0x7F;

void appendRight(std::string& line, std::string_view text, std::size_t columns) {
  if (text.size() < columns) line.append(columns - text.size(), ' ');
  line += text;
}

// The first blank ends the word also where a number fills its column.
void appendLine(std::string& block, std::string_view word, std::string_view total, std::string_view first,
                std::string_view second, std::string_view unit) {
  appendRight(block, word, kNameColumns);
  block += ' ';
  appendRight(block, total, kFirstColumns);
  for (const std::string_view column : {first, second, unit}) {
    block += ' ';
    appendRight(block, column, kColumns);
  }
  block += '\n';
}

void appendAmount(std::string& block, std::string_view word, const ResourceAmount& amount,
                  std::string_view unit) {
  appendLine(block, word, std::to_string(amount.total), std::to_string(amount.first),
             std::to_string(amount.second), amount.total == 0 ? "none" : unit);
}

// A process chooses its own name: it must not look like other lines.
std::string onOneLine(std::string name) {
  for (char& character : name) {
    const auto byte = static_cast<unsigned char>(character);
    if (byte < ' ' || byte == kDelete) character = '?';
  }
  return name;
}

bool copyFile(const std::filesystem::path& path, const WriteText& write) {
  std::ifstream file(path);
  std::ostringstream content;
  if (!file || !(content << file.rdbuf())) return false;
  write(content.str());
  return true;
}

}  // namespace

std::string processBlock(const ProcessResources& resources) {
  std::string block =
      "RESOURCE " + onOneLine(resources.name) + " (" + std::to_string(resources.process_identifier) + ")\n";
  appendAmount(block, "cpu_time", resources.cpu_ms, "ms");
  appendAmount(block, "phys_mem", resources.phys_kib, "KiB");
  appendAmount(block, "wired_mem", resources.wired_kib, "KiB");
  if (resources.footprint_kib) {
    appendAmount(block, "phys_footprint", *resources.footprint_kib, "KiB");
  } else {
    appendLine(block, "phys_footprint", "-", "-", "-", "denied");
  }
  return block;
}

void listProcesses(const std::filesystem::path& proc, const WriteText& write) {
  ProcessReader reader(proc);
  for (const std::int32_t identifier : reader.processIdentifiers()) {
    if (const auto resources = reader.read(identifier)) write(processBlock(*resources));
  }
}

std::optional<std::string> listZones(const std::filesystem::path& proc, const WriteText& write) {
  if (copyFile(proc / "slabinfo", write) || copyFile(proc / "meminfo", write)) return std::nullopt;
  return "neither slabinfo nor meminfo can be read in " + proc.string();
}

}  // namespace tal
