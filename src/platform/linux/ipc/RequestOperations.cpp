// What each request asks of the service: the part of RequestRunner that knows
// the operations.

#include <utility>

#include "platform/linux/ipc/RequestRunner.h"

namespace tal {

void RequestRunner::carryOut(RequestBatch::Entry& entry) {
  if (entry.error) {
    if (entry.error->wants_reply) encoder_.error(*entry.error);
    return;
  }
  Request& request = entry.request;
  const std::uint64_t call = request.call;
  const ReporterID id = request.reporter_id;
  // Two words, so that the callback needs no memory of its own.
  const auto answer_bool = [this, call](bool result) {
    if (call != 0) encoder_.boolean(call, result);
  };
  switch (request.operation) {
    case Operation::kSendMessage:
      return sendMessage(request);
    case Operation::kHello:
      return hello(request);
    case Operation::kCreateReportingSession:
      return client_->createReportingSession(id, answer_bool);
    case Operation::kSetServiceType:
      return client_->setServiceType(request.service_type, id, answer_bool);
    case Operation::kSetConfiguration:
      return client_->setConfiguration(request.configuration, id, answer_bool);
    case Operation::kStartReportingSessionForID:
      return startSession(request);
    case Operation::kStopReportingSessionForID:
      return client_->stopReportingSessionForID(id, answer_bool);
    case Operation::kDestroyReportingSession:
      return client_->destroyReportingSession(id, answer_bool);
    case Operation::kGetServiceNameForReporterID:
      return client_->getServiceNameForReporterID(id, [this, call](AudioServiceType type) {
        if (call != 0) encoder_.serviceType(call, type);
      });
    case Operation::kValidateReporterID:
      return client_->validateReporterID(id, [this, call](const MessageDict& answer) {
        if (call != 0) encoder_.dict(call, answer);
      });
    case Operation::kGetAllReporters:
      return client_->getAllReporters([this, call](const std::vector<ReporterID>& ids) {
        if (call != 0) encoder_.reporterIDs(call, ids);
      });
    case Operation::kKillService:
      return;  // has taken effect on the I/O thread
  }
}

// The reply can be called long after this: when the session stops, perhaps after
// the connection is gone, perhaps never.
void RequestRunner::startSession(const Request& request) {
  const auto answer = [weak = weak_from_this(), call = request.call](bool result) {
    const auto self = weak.lock();
    if (!self || call == 0) return;
    self->encoder_.boolean(call, result);
    if (!self->running_) self->sendReplies();
  };
  client_->startReportingSessionForID(request.reporter_id, answer);
}

void RequestRunner::sendMessage(Request& request) {
  const DurabilityGate& gate = context_.durable_replies.gate();
  const std::uint64_t row_before = durable_ ? gate.lastRow() : 0;
  message_answer_.reset();
  client_->sendMessage(std::move(request.message), request.category, request.type, request.reporter_ids,
                       [this](std::optional<ReportingError> error) { message_answer_ = error; });
  if (!message_answer_ || request.call == 0) return;
  if (durable_ && !*message_answer_) {
    const std::uint64_t row_after = gate.lastRow();
    if (row_after != row_before) return hold(request.call, row_before + 1, row_after);
  }
  answerMessage(request.call);
}

void RequestRunner::answerMessage(std::uint64_t call) {
  if (!*message_answer_) return encoder_.null(call);
  switch (**message_answer_) {
    case ReportingError::kReportingDisabled:
      return encoder_.reportingDisabled(call);
    case ReportingError::kKeepsTooMuch:
      return encoder_.error(call, WireErrorCode::kKeepsTooMuch,
                            "the sessions of this connection keep too many messages");
  }
}

void RequestRunner::hello(const Request& request) {
  if (request.durable) context_.durable_replies.listen();
  durable_ = request.durable;
  if (request.call != 0) encoder_.hello(request.call, context_.server_name);
}

void RequestRunner::hold(std::uint64_t call, std::uint64_t first_row, std::uint64_t last_row) {
  if (held_.empty()) context_.durable_replies.add(weak_from_this());
  held_.push_back({.call = call, .first_row = first_row, .last_row = last_row});
  holds_new_ = true;
}

bool RequestRunner::rowsSettled(std::uint64_t up_to) {
  const DurabilityGate& gate = context_.durable_replies.gate();
  while (!held_.empty() && held_.front().last_row <= up_to) {
    const HeldReply& reply = held_.front();
    if (gate.wasGivenUp(reply.first_row, reply.last_row)) {
      encoder_.error(reply.call, WireErrorCode::kNotStored, "the message could not be stored");
    } else {
      encoder_.null(reply.call);
    }
    held_.pop_front();
  }
  sendReplies();
  tellIfSettled();
  return !held_.empty();
}

}  // namespace tal
