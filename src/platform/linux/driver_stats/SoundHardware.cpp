#include "platform/linux/driver_stats/SoundHardware.h"

#include <algorithm>
#include <cerrno>
#include <utility>

#include "platform/linux/driver_stats/CounterDelta.h"
#include "platform/linux/driver_stats/TextLines.h"

namespace tal {

namespace {

constexpr std::string_view kCards = "/proc/asound/cards";
constexpr std::string_view kInterrupts = "/proc/interrupts";
constexpr std::string_view kSoundClass = "/sys/class/sound";

constexpr std::string_view kPowerGroup = "StateTransitionTimes_ms";
constexpr std::string_view kInterruptSubgroup = "MCA";
constexpr unsigned kNumberBits = 64;

// Hardware comes and goes while it is looked at: then there is nothing to read, and
// nothing wrong.
constexpr bool isAbsence(int error) { return error == ENOENT || error == ENODEV || error == ENXIO; }

void note(int error, ChannelReadings& readings) {
  if (readings.error == 0 && error != 0 && !isAbsence(error)) readings.error = error;
}

std::string pathOfCard(const SoundCard& card) { return "/proc/asound/card" + std::to_string(card.number); }
std::string classNode(std::string_view name) { return std::string(kSoundClass) + '/' + std::string(name); }
std::string classOfCard(const SoundCard& card) { return classNode("card" + std::to_string(card.number)); }

bool isPcmDirectory(std::string_view name, char suffix) {
  return name.starts_with("pcm") && name.ends_with(suffix);
}

}  // namespace

void SoundHardware::read(const DriverStatsChannelSet& wanted, ChannelReadings& readings) {
  const bool wants_capture = isWanted(wanted, std::string(capture_.group), std::nullopt);
  const bool wants_playback = isWanted(wanted, std::string(playback_.group), std::nullopt);
  const bool wants_interrupts = isWanted(wanted, std::nullopt, std::string(kInterruptSubgroup));
  const bool wants_power = isWanted(wanted, std::string(kPowerGroup), std::nullopt);
  if (!wants_capture && !wants_playback && !wants_interrupts && !wants_power) return;
  const HostFiles::Content listed = files_.read(kCards);
  note(listed.error, readings);
  const std::vector<SoundCard> cards = parseSoundCards(listed.text);
  ++reading_number_;
  if (wants_capture) readSubstreams(cards, capture_, readings);
  if (wants_playback) readSubstreams(cards, playback_, readings);
  if (wants_interrupts && !cards.empty()) readInterrupts(cards, readings);
  if (wants_power) readPowerTimes(cards, readings);
}

void SoundHardware::readSubstreams(const std::vector<SoundCard>& cards, Direction& direction,
                                   ChannelReadings& readings) {
  Peaks peaks;  // of those that are still there
  for (const SoundCard& card : cards) {
    for (const std::string& device : files_.namesIn(pathOfCard(card))) {
      if (isPcmDirectory(device, direction.suffix)) readDevice(card, device, direction, peaks, readings);
    }
  }
  direction.peaks = std::move(peaks);
}

void SoundHardware::readDevice(const SoundCard& card, const std::string& device, const Direction& direction,
                               Peaks& peaks, ChannelReadings& readings) const {
  const std::string path = pathOfCard(card) + '/' + device + "/sub";
  const std::string name = card.identifier + ' ' + device + " sub";
  // Substreams are numbered without gaps.
  for (int i = 0;; ++i) {
    const std::string number = std::to_string(i);
    const auto reading = readStatus(path + number, readings);
    if (!reading) return;
    addSubstream(card, name + number, *reading, direction, peaks, readings);
  }
}

std::optional<PcmReading> SoundHardware::readStatus(const std::string& directory,
                                                    ChannelReadings& readings) const {
  const HostFiles::Content status = files_.read(directory + "/status");
  note(status.error, readings);
  if (!status.ok()) return std::nullopt;
  PcmReading reading{.status = std::nullopt, .kernel_long_bits = kernel_long_bits_};
  if (status.text.starts_with("closed")) return reading;
  reading.status = parsePcmStatus(status.text, files_.read(directory + "/hw_params").text);
  return reading;
}

void SoundHardware::addSubstream(const SoundCard& card, const std::string& name, const PcmReading& reading,
                                 const Direction& direction, Peaks& peaks, ChannelReadings& readings) const {
  const auto known = direction.peaks.find(name);
  auto history = known == direction.peaks.end() ? std::make_shared<PeakHistory>() : known->second;
  if (reading.status) history->add(reading_number_, reading.status->largest_available);
  peaks.emplace(name, history);

  DriverStatsDescription description{.format = DriverStatsFormat::kSimple,
                                     .driver_name = card.driver,
                                     .group = std::string(direction.group),
                                     .channel_name = name + " Frames",
                                     .unit_label = "frames"};
  readings.channels.push_back({description, reading});
  description.channel_name = name + ' ' + std::string(direction.peak_name);
  readings.channels.push_back({std::move(description), PeakReading{std::move(history), reading_number_}});
}

void SoundHardware::readInterrupts(const std::vector<SoundCard>& cards, ChannelReadings& readings) const {
  const HostFiles::Content table = files_.read(kInterrupts);
  note(table.error, readings);
  const std::vector<InterruptLine> lines = parseInterrupts(table.text);
  for (const SoundCard& card : cards) {
    const std::vector<std::uint32_t> own_lines = interruptLinesOf(card);
    const std::string own_name = ":card" + std::to_string(card.number);
    InterruptReading reading;
    for (const InterruptLine& line : lines) {
      const bool is_own = line.handlers.ends_with(own_name) ||
                          std::find(own_lines.begin(), own_lines.end(), line.number) != own_lines.end();
      if (!is_own || line.handlers.empty() || line.isShared()) continue;
      for (const auto& [processor, count] : line.counts) reading.counts[{line.number, processor}] = count;
    }
    if (reading.counts.empty()) continue;
    readings.channels.push_back({{.format = DriverStatsFormat::kSimple,
                                  .driver_name = card.driver,
                                  .subgroup = std::string(kInterruptSubgroup),
                                  .channel_name = card.identifier + " Interrupts",
                                  .unit_label = "interrupts"},
                                 std::move(reading)});
  }
}

std::vector<std::uint32_t> SoundHardware::interruptLinesOf(const SoundCard& card) const {
  const std::string device = classOfCard(card) + "/device";
  std::vector<std::uint32_t> lines;
  for (const std::string& name : files_.namesIn(device + "/msi_irqs")) {
    if (const auto line = numberOf<std::uint32_t>(name)) lines.push_back(*line);
  }
  if (!lines.empty()) return lines;
  const auto line = readNumber(device + "/irq");
  if (line && *line > 0) lines.push_back(static_cast<std::uint32_t>(*line));
  return lines;
}

void SoundHardware::readPowerTimes(const std::vector<SoundCard>& cards, ChannelReadings& readings) const {
  const std::vector<std::string> sound_class = files_.namesIn(kSoundClass);
  for (const SoundCard& card : cards) {
    for (const std::string& device : devicesOf(card, sound_class)) {
      auto reading = readPowerTimesOf(device);
      if (!reading) continue;
      readings.channels.push_back(
          {{.format = DriverStatsFormat::kState,
            .driver_name = card.driver,
            .group = std::string(kPowerGroup),
            .channel_name = card.identifier + ' ' + device.substr(device.rfind('/') + 1),
            .unit_label = "ms"},
           std::move(*reading)});
    }
  }
}

// The device behind the card, and its codecs.
std::vector<std::string> SoundHardware::devicesOf(const SoundCard& card,
                                                  const std::vector<std::string>& sound_class) const {
  std::vector<std::string> devices;
  const auto add = [&](const std::string& node) {
    std::string device = files_.resolved(node + "/device");
    if (!device.empty() && std::find(devices.begin(), devices.end(), device) == devices.end()) {
      devices.push_back(std::move(device));
    }
  };
  add(classOfCard(card));
  const std::string codec_prefix = "hwC" + std::to_string(card.number) + "D";
  for (const std::string& name : sound_class) {
    if (name.starts_with(codec_prefix)) add(classNode(name));
  }
  return devices;
}

// Nothing where the driver does without run-time power management: the times stand still.
std::optional<StateReading> SoundHardware::readPowerTimesOf(const std::string& device) const {
  const std::string power = device + "/power";
  const HostFiles::Content status = files_.read(power + "/runtime_status");
  if (!status.ok() || status.text.starts_with("unsupported")) return std::nullopt;
  const auto active = readNumber(power + "/runtime_active_time");
  const auto suspended = readNumber(power + "/runtime_suspended_time");
  if (!active || !suspended) return std::nullopt;
  // The kernel does not count the transitions.
  return StateReading{.states = {{.name = "active", .transitions = 0, .residency = *active},
                                 {.name = "suspended", .transitions = 0, .residency = *suspended}},
                      .largest = largestOfBits(kNumberBits)};
}

std::optional<std::uint64_t> SoundHardware::readNumber(const std::string& path) const {
  const auto number = parseSimple(files_.read(path).text, kNumberBits);
  return number ? std::optional(number->value) : std::nullopt;
}

}  // namespace tal
