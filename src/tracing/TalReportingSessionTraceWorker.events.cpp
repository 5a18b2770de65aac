// What the trace service tells of, on its own thread.

#include "tracing/TalReportingSessionTraceWorker.h"

#include <utility>

namespace tal {

// A failed start is signalled too: nobody is to wait 15 seconds for it.
void TraceEvents::perftrailDidStart(const Error& error) {
  if (error) {
    takeSession();
    TAL_LOG_ERROR(log_, "perftrailDidStart ", *error);
  } else {
    TAL_LOG_INFO(log_, "Performance Trace Started");
  }
  semaphore_->signal();
}

void TraceEvents::perftrailDidStop(const Error& error) {
  if (error) {
    takeSession();
    TAL_LOG_ERROR(log_, "perftrailDidStop ", *error);
  } else {
    TAL_LOG_INFO(log_, "Performance Trace Stopped");
  }
}

void TraceEvents::perftrailDidComplete(const std::string& trace_url, std::string_view, const Error& error) {
  if (const auto session = takeSession()) session->setDelegate({});
  if (error) {
    TAL_LOG_ERROR(log_, "perftrailDidComplete ", *error);
  } else {
    {
      const std::lock_guard lock(mutex_);
      final_trace_url_ = trace_url;
    }
    TAL_LOG_INFO(log_, "Performance Trace Completed: ", trace_url);
  }
  semaphore_->signal();
}

void TraceEvents::begin(std::unique_ptr<PerftrailConfiguration> configuration,
                        std::shared_ptr<PerftrailSession> session) {
  abandon();
  while (semaphore_->wait(std::chrono::nanoseconds(0))) {
  }
  const std::lock_guard lock(mutex_);
  trace_config_ = std::move(configuration);
  trace_session_ = std::move(session);
  final_trace_url_.clear();
}

void TraceEvents::abandon() {
  if (const auto session = takeSession()) session->setDelegate({});
}

std::shared_ptr<PerftrailSession> TraceEvents::takeSession() {
  const std::lock_guard lock(mutex_);
  trace_config_.reset();
  return std::exchange(trace_session_, nullptr);
}

std::shared_ptr<PerftrailSession> TraceEvents::traceSession() const {
  const std::lock_guard lock(mutex_);
  return trace_session_;
}

std::string TraceEvents::finalTraceURL() const {
  const std::lock_guard lock(mutex_);
  return final_trace_url_;
}

}  // namespace tal
