#include "reporters/pipewire/StreamSession.h"

#include <utility>

namespace tal {

StreamSession::StreamSession(StreamDirection direction, const ReportedStream& stream, Instant now,
                             ReportingChannel& channel)
    : direction_(direction),
      opened_(now),
      channel_(channel),
      reporterID_(channel.openSession(stream)),
      unchangedSince_(now) {}

void StreamSession::update(const StreamFacts& facts, Instant now) {
  // What is known stands until something else is known: a stream that is being moved or
  // suspended is without a device or format for moments that mean nothing.
  const bool otherFormat = told_ && facts.format && facts.format != told_->format;
  if (running_ && (!facts.running || otherFormat)) stop(now);
  if (told_) {
    if (facts.device && facts.device != told_->device) {
      told_->device = facts.device;
      unchangedSince_ = now;
      send(ReportCategory::kRouteChange, ReportType::kGeneric, {{"active_devices", *facts.device}}, now);
    }
    if (direction_ == StreamDirection::kPlayback && facts.device && facts.gain != told_->gain) {
      told_->gain = facts.gain;
      unchangedSince_ = now;
      send(ReportCategory::kVolume, ReportType::kGeneric, {{"RvSessionVolume", facts.gain}}, now);
    }
  }
  if (!running_ && facts.running) start(facts, now);
}

void StreamSession::start(const StreamFacts& facts, Instant now) {
  if (!told_) told_ = facts;
  if (facts.format) told_->format = facts.format;
  running_ = true;
  ++stretchIndex_;
  unchangedSince_ = now;
  cycles_ = 0;
  smallestFrames_.reset();
  repeatStart();
}

void StreamSession::repeatStart() {
  if (!running_) return;
  send(startStopCategory(), ReportType::kStart, startStopFields(true), unchangedSince_);
}

void StreamSession::stop(Instant now) {
  running_ = false;
  send(startStopCategory(), ReportType::kStop, startStopFields(false), now);
}

void StreamSession::close(Instant now) {
  running_ = false;
  ReportFields fields = startStopFields(false);
  fields.emplace_back("session_duration", std::chrono::duration<double>(now.steady - opened_.steady).count());
  fields.emplace_back("xrun_episodes", xruns_.episodes());
  fields.emplace_back("xrun_starved_seconds", xruns_.starved().count());
  send(startStopCategory(), ReportType::kStop, std::move(fields), now);
  channel_.closeSession(reporterID_);
}

void StreamSession::addCycle(const StreamCycle& cycle, Instant now) {
  if (!running_) return;
  if (std::exchange(lastCycle_, cycle.when) != cycle.when) ++cycles_;
  if (!smallestFrames_ || cycle.frames < *smallestFrames_) smallestFrames_ = cycle.frames;
  if (!cycle.xrun || std::exchange(lastXrun_, cycle.when) == cycle.when) return;
  if (!xruns_.addXrun(cycle.when, cycle.length)) return;
  send(ReportCategory::kIo, ReportType::kError,
       {{"issue_type", std::string("overload")},
        {"smallest_buffer_frame_size", static_cast<std::int64_t>(*smallestFrames_)},
        {"io_cycle", cycles_}},
       now.at(cycle.when));
}

ReportCategory StreamSession::startStopCategory() const {
  return direction_ == StreamDirection::kPlayback ? ReportCategory::kPlayback : ReportCategory::kRecord;
}

ReportFields StreamSession::startStopFields(bool running) const {
  const bool playback = direction_ == StreamDirection::kPlayback;
  ReportFields fields{{playback ? "session_output_running" : "session_input_running", running},
                      {"stretch_index", stretchIndex_}};
  if (!told_) return fields;
  if (playback) fields.emplace_back("RvSessionVolume", told_->gain);
  if (told_->device) fields.emplace_back("active_devices", *told_->device);
  if (told_->format) {
    fields.emplace_back("session_selected_format", formatText(*told_->format));
    fields.emplace_back("mFormatID", told_->format->encoding);
    if (told_->format->channels != 0) {
      fields.emplace_back("mChannelsPerFrame", static_cast<std::int64_t>(told_->format->channels));
    }
  }
  return fields;
}

void StreamSession::send(ReportCategory category, ReportType type, ReportFields fields, Instant when) {
  fields.emplace_back("talreporting_timestamp", when.epochSeconds());
  channel_.sendMessage(reporterID_, {category, type, std::move(fields)});
}

}  // namespace tal
