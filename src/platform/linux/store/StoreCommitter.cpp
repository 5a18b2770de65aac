#include "platform/linux/store/StoreCommitter.h"

#include <string>

#include "core/MessageJson.h"
#include "platform/linux/process/StartupError.h"
#include "platform/linux/store/StoreWriter.h"

namespace tal {

namespace {

using std::chrono_literals::operator""ms;

// A durable reply may have to wait for one of these.
constexpr std::chrono::milliseconds kMoment = 5ms;
// How far the store may exceed its size before somebody looks; also paces
// retention to the input while rows keep coming.
constexpr std::size_t kLookAfterBytes = std::size_t{512} * 1024;
// How soon a changed setting, or a row that has become too old, is noticed.
constexpr Clock::Instant kLookAfter = 400ms;

}  // namespace

StoreCommitter::StoreCommitter(Dependencies dependencies)
    : dependencies_(std::move(dependencies)),
      path_(dependencies_.directory / "store.db"),
      settings_reader_(dependencies_.settings, dependencies_.log),
      settings_(settings_reader_.read()) {
  try {
    database_ = std::make_unique<StoreDatabase>(path_);
    database_->setFullySynchronous(settings_.fully_synchronous);
  } catch (const StoreError& error) {
    throw StartupError("cannot use the store " + path_.string() + ": " + error.what() +
                       "; it is left as it is, move it away to begin a new one");
  }
}

bool StoreCommitter::commit(const std::vector<RowChunk>& batch, const GivenUpRows& given_up) {
  try {
    if (!database_) {
      database_ = std::make_unique<StoreDatabase>(path_);
      database_->setFullySynchronous(settings_.fully_synchronous);
    }
    database_->begin();
    if (given_up.rows > 0) insertReport(given_up);
    for (const RowChunk& chunk : batch) {
      chunk.forEach([this](const StoreRow& row) { database_->insert(row); });
    }
    database_->commit();
  } catch (const StoreError& error) {
    ++failures_;
    noteFailure(error);
    return false;
  }
  for (const RowChunk& chunk : batch) bytes_since_maintenance_ += chunk.capacity();
  noteSuccess(given_up);
  return true;
}

void StoreCommitter::insertReport(const GivenUpRows& given_up) {
  std::string payload;
  appendJson(payload, MessageDict{{"rows", given_up.rows},
                                  {"since", MessageDate{given_up.since}},
                                  {"until", MessageDate{given_up.until}}});
  database_->insert({.table = StoreTable::kEvents,
                     .recorded_at = dependencies_.clock.secondsSince1970(),
                     .number = 0,
                     .name = StoreWriter::kRowsGivenUpEvent,
                     .payload = payload});
}

void StoreCommitter::noteFailure(const StoreError& error) {
  if (database_) database_->rollBack();
  if (error.cause() == StoreError::Cause::kLasting) database_.reset();
  if (failure_lines_.allows(dependencies_.clock.monotonic())) {
    TAL_LOG_ERROR(dependencies_.log, "cannot write the store ", path_.string(), ": ", error.what(),
                  "; rows wait in memory and it is tried again");
  }
}

void StoreCommitter::noteSuccess(const GivenUpRows& given_up) {
  if (given_up.rows > 0) {
    TAL_LOG_ERROR(dependencies_.log, given_up.rows, " rows were given up and are not in the store");
  }
  if (failures_ > 0) TAL_LOG(dependencies_.log, "the store ", path_.string(), " is written again");
  failures_ = 0;
}

bool StoreCommitter::maintenanceIsDue() const {
  if (failures_ > 0 || !database_) return false;
  return maintenance_unfinished_ || bytes_since_maintenance_ >= kLookAfterBytes ||
         (bytes_since_maintenance_ > 0 && dependencies_.clock.monotonic() - maintained_at_ >= kLookAfter);
}

void StoreCommitter::maintainForAMoment() {
  maintained_at_ = dependencies_.clock.monotonic();
  bytes_since_maintenance_ = 0;
  maintenance_unfinished_ = false;
  const bool was_fully_synchronous = settings_.fully_synchronous;
  settings_ = settings_reader_.read();
  try {
    if (settings_.fully_synchronous != was_fully_synchronous) {
      database_->setFullySynchronous(settings_.fully_synchronous);
    }
    carryOutSteps();
  } catch (const StoreError& error) {
    noteFailure(error);
  }
}

void StoreCommitter::carryOutSteps() {
  const double now = dependencies_.clock.secondsSince1970();
  const auto nextStep = [&] { return nextRetentionStep(database_->retentionState(now), settings_.limits); };
  const auto outboxIsOver = [&] { return database_->outboxIsOver(settings_.most_outbox_bytes); };
  bool outbox_is_over = outboxIsOver();
  RetentionStep step = nextStep();
  const auto isUnfinished = [&] { return outbox_is_over || step.action != RetentionStep::Action::kNothing; };
  if (!isUnfinished()) return;
  const auto end = std::chrono::steady_clock::now() + kMoment;
  database_->begin();
  while (isUnfinished() && std::chrono::steady_clock::now() < end) {
    if (outbox_is_over) {
      database_->trimOutbox(settings_.most_outbox_bytes);
      outbox_is_over = outboxIsOver();
    } else {
      database_->carryOut(step);
    }
    step = nextStep();
  }
  database_->commit();
  maintenance_unfinished_ = isUnfinished();
  outbox_losses_ += database_->takeOutboxLosses();
  if (outbox_losses_ > 0 && outbox_lines_.allows(dependencies_.clock.monotonic())) tellOfOutboxLosses();
}

void StoreCommitter::tellOfOutboxLosses() {
  TAL_LOG_ERROR(dependencies_.log, outbox_losses_,
                " messages for brokers were given up, the oldest: the outbox is full or they are too old");
  outbox_losses_ = 0;
}

void StoreCommitter::close() {
  database_.reset();
  if (outbox_losses_ > 0) tellOfOutboxLosses();
}

}  // namespace tal
