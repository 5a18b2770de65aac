#include "platform/linux/tracing/helper/Recording.h"

#include <array>
#include <cstring>
#include <memory>

namespace tal {

namespace {

constexpr char kChannel[] = "talreporting";
constexpr char kSignpostEvents[] = "talreporting:*";
constexpr char kAllEvents[] = "*";
// Events are discarded, and counted, when the disk falls behind: a full second of the fastest programs fits.
constexpr std::uint64_t kSubBufferBytes = std::uint64_t{1} << 20;
constexpr std::uint64_t kSubBuffers = 16;

struct DestroyHandle {
  void operator()(lttng_handle* handle) const { lttng_destroy_handle(handle); }
};
struct DestroyChannel {
  void operator()(lttng_channel* channel) const { lttng_channel_destroy(channel); }
};
struct DestroyEvent {
  void operator()(lttng_event* event) const { lttng_event_destroy(event); }
};

std::string failed(const char* what, int code) {
  return code < 0 ? std::string(what) + ": " + lttng_strerror(code) : "";
}

}  // namespace

Recording::~Recording() { destroy(); }

std::string Recording::start(Events events) {
  const std::string url = "file://" + directory_;
  std::string error = failed("lttng_create_session", lttng_create_session(name_.c_str(), url.c_str()));
  if (!error.empty()) return error;
  exists_ = true;
  lttng_domain domain{};
  domain.type = LTTNG_DOMAIN_UST;
  domain.buf_type = LTTNG_BUFFER_PER_UID;
  const std::unique_ptr<lttng_handle, DestroyHandle> handle(lttng_create_handle(name_.c_str(), &domain));
  if (!handle) return "lttng_create_handle: out of memory";
  error = prepare(*handle, domain, events);
  if (!error.empty()) return error;
  return failed("lttng_start_tracing", lttng_start_tracing(name_.c_str()));
}

std::string Recording::prepare(lttng_handle& handle, lttng_domain& domain, Events events) const {
  const std::unique_ptr<lttng_channel, DestroyChannel> channel(lttng_channel_create(&domain));
  const std::unique_ptr<lttng_event, DestroyEvent> event(lttng_event_create());
  if (!channel || !event) return "lttng_channel_create: out of memory";
  std::strncpy(channel->name, kChannel, sizeof channel->name - 1);
  channel->attr.overwrite = 0;
  channel->attr.subbuf_size = kSubBufferBytes;
  channel->attr.num_subbuf = kSubBuffers;
  std::string error = failed("lttng_enable_channel", lttng_enable_channel(&handle, channel.get()));
  if (!error.empty()) return error;

  for (const auto type : {LTTNG_EVENT_CONTEXT_VPID, LTTNG_EVENT_CONTEXT_VTID, LTTNG_EVENT_CONTEXT_PROCNAME}) {
    lttng_event_context context{};
    context.ctx = type;
    error = failed("lttng_add_context", lttng_add_context(&handle, &context, nullptr, kChannel));
    if (!error.empty()) return error;
  }
  const char* pattern = events == Events::kAll ? kAllEvents : kSignpostEvents;
  std::strncpy(event->name, pattern, sizeof event->name - 1);
  event->type = LTTNG_EVENT_TRACEPOINT;
  event->loglevel_type = LTTNG_EVENT_LOGLEVEL_ALL;
  return failed("lttng_enable_event", lttng_enable_event(&handle, event.get(), kChannel));
}

std::string Recording::stop() { return failed("lttng_stop_tracing", lttng_stop_tracing(name_.c_str())); }

std::string Recording::destroy() {
  if (!exists_) return "";
  exists_ = false;
  return failed("lttng_destroy_session", lttng_destroy_session(name_.c_str()));
}

}  // namespace tal
