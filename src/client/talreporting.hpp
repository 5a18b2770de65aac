/// talreporting.hpp: talreporting.h for C++17 and later, header-only. What the C header says of threads,
/// audio threads, delivery, bounds and errors holds here; this file only adds ownership and the types of the
/// language.
///
///     tal::client::Connection connection;
///     tal::client::Session session(connection, TAL_SERVICE_LONG_FORM_AUDIO);
///     session.send(tal::client::Message{{"session_output_running", true}, {"RvSessionVolume", 0.5}},
///                  TAL_CATEGORY_PLAYBACK, TAL_TYPE_START);
///     connection.flush(std::chrono::seconds(1));
///
/// Nothing here throws but the constructors of Message and Connection: std::bad_alloc when memory is lacking,
/// and Connection std::invalid_argument for an option out of range.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <future>
#include <initializer_list>
#include <memory>
#include <new>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <type_traits>
#include <utility>
#include <vector>

#include "talreporting.h"

namespace tal::client {

/// A dictionary to send. Belongs to one thread at a time. See tal_message for keys and for what spoils it.
class Message {
 public:
  /// A date value.
  using Date = std::chrono::system_clock::time_point;
  /// A data value: borrowed bytes.
  struct Data {
    const void* bytes;
    std::size_t size;
  };

  /// One entry of a list in braces.
  class Entry {
   public:
    template <typename Value>
    Entry(std::string_view key, const Value& value)
        : key_(key), value_(&value), add_([](Message& message, std::string_view k, const void* v) {
            message.add(k, *static_cast<const Value*>(v));
          }) {}
    Entry(std::string_view key, const char* value)
        : key_(key), value_(value), add_([](Message& message, std::string_view k, const void* v) {
            message.add(k, static_cast<const char*>(v));
          }) {}

   private:
    friend class Message;
    std::string_view key_;
    const void* value_;
    void (*add_)(Message&, std::string_view, const void*);
  };

  /// Room for `capacity` bytes before it allocates again; 0 is the default of tal_message_new().
  explicit Message(std::size_t capacity = 0) : handle_(tal_message_new(capacity)) {
    if (!handle_) throw std::bad_alloc();
  }
  Message(std::initializer_list<Entry> entries) : Message() {
    for (const Entry& entry : entries) entry.add_(*this, entry.key_, entry.value_);
  }

  /// Adds an entry: bool, any integer, float or double, text, Date or Data.
  template <typename Value>
  Message& add(std::string_view key, const Value& value) noexcept {
    put(key.data(), key.size(), value);
    return *this;
  }
  /// Adds a nested map whose entries `fill(*this)` adds.
  template <typename Fill>
  Message& addMap(std::string_view key, Fill&& fill) {
    tal_message_put_map(get(), key.data(), key.size());
    return nest(std::forward<Fill>(fill));
  }
  /// Adds a nested array whose elements `fill(*this)` appends.
  template <typename Fill>
  Message& addArray(std::string_view key, Fill&& fill) {
    tal_message_put_array(get(), key.data(), key.size());
    return nest(std::forward<Fill>(fill));
  }

  /// The same inside an array, where there are no keys.
  template <typename Value>
  Message& append(const Value& value) noexcept {
    put(nullptr, 0, value);
    return *this;
  }
  template <typename Fill>
  Message& appendMap(Fill&& fill) {
    tal_message_put_map(get(), nullptr, 0);
    return nest(std::forward<Fill>(fill));
  }
  template <typename Fill>
  Message& appendArray(Fill&& fill) {
    tal_message_put_array(get(), nullptr, 0);
    return nest(std::forward<Fill>(fill));
  }

  /// Empty and sound again; keeps its memory.
  // NOLINTNEXTLINE(readability-make-member-function-const): it changes the message, if not the handle.
  void reset() noexcept { tal_message_reset(get()); }
  tal_status status() const noexcept { return tal_message_status(get()); }
  tal_message* get() const noexcept { return handle_.get(); }

 private:
  template <typename Fill>
  Message& nest(Fill&& fill) {
    std::forward<Fill>(fill)(*this);
    tal_message_end(get());
    return *this;
  }

  template <typename Value>
  void put(const char* key, std::size_t keyBytes, const Value& value) noexcept {
    if constexpr (std::is_same_v<Value, bool>) {
      tal_message_put_bool(get(), key, keyBytes, value);
    } else if constexpr (std::is_integral_v<Value> && std::is_signed_v<Value>) {
      tal_message_put_int(get(), key, keyBytes, value);
    } else if constexpr (std::is_integral_v<Value>) {
      tal_message_put_uint(get(), key, keyBytes, value);
    } else if constexpr (std::is_floating_point_v<Value>) {
      tal_message_put_double(get(), key, keyBytes, static_cast<double>(value));
    } else if constexpr (std::is_same_v<Value, Date>) {
      tal_message_put_date(get(), key, keyBytes,
                           std::chrono::duration<double>(value.time_since_epoch()).count());
    } else if constexpr (std::is_same_v<Value, Data>) {
      tal_message_put_data(get(), key, keyBytes, value.bytes, value.size);
    } else {
      const std::string_view text(value);
      tal_message_put_string(get(), key, keyBytes, text.data(), text.size());
    }
  }

  struct Free {
    void operator()(tal_message* message) const noexcept { tal_message_free(message); }
  };
  std::unique_ptr<tal_message, Free> handle_;
};

/// A signpost around a block: begins with the object and ends with it. The texts outlive it; see
/// talreporting_signpost_begin().
class Signpost {
 public:
  Signpost(const char* subsystem, const char* name) noexcept : subsystem_(subsystem), name_(name) {
    talreporting_signpost_begin(subsystem_, name_);
  }
  Signpost(const Signpost&) = delete;
  Signpost& operator=(const Signpost&) = delete;
  ~Signpost() { talreporting_signpost_end(subsystem_, name_); }

 private:
  const char* subsystem_;
  const char* name_;
};

/// What to be told of and how to connect: tal_options and tal_callbacks with std::function. The functions are
/// called on the library's thread and must not throw (a throw ends the program).
struct Options {
  std::string socketPath{};  ///< Empty: as the C header says.
  bool durableAcknowledgement = false;
  std::size_t queueBytes = 0;  ///< 0: the default, as for all numbers here.
  std::size_t maxFrameBytes = 0;
  std::chrono::milliseconds reconnectMin{0};
  std::chrono::milliseconds reconnectMax{0};
  std::chrono::milliseconds pollInterval{0};
  std::function<void(std::string_view server)> onConnected{};
  std::function<void(const tal_error&)> onDisconnected{};
  std::function<void(const tal_reply&)> onReply{};
  std::function<void(const tal_error&)> onError{};
};

/// What a look-up that waits found, or why there is nothing.
template <typename Value>
struct Answer {
  std::optional<Value> value;
  tal_error error{};  ///< Holds when `value` is empty.
};

/// A connection to the daemon. Copies share it; it ends with the last copy or session, without waiting: call
/// flush() or close() first where what is queued should still arrive. Its functions may be called from any
/// thread.
class Connection {
 public:
  explicit Connection(Options options = {}) : shared_(std::make_shared<Shared>(std::move(options))) {}

  /// See tal_wait_connected().
  tal_status waitConnected(std::chrono::milliseconds timeout, tal_error* error = nullptr) const noexcept {
    return tal_wait_connected(get(), milliseconds(timeout), error);
  }
  tal_status flush(std::chrono::milliseconds timeout) const noexcept {
    return tal_flush(get(), milliseconds(timeout));
  }
  /// Ends it for all copies and sessions. See tal_connection_close().
  tal_status close(std::chrono::milliseconds timeout) const noexcept {
    return tal_connection_close(get(), milliseconds(timeout));
  }

  /// To all started sessions of all programs.
  tal_status broadcast(const Message& message, std::uint32_t category, std::uint16_t type,
                       std::uint64_t tag = 0) const noexcept {
    return tal_send(get(), message.get(), category, type, nullptr, 0, tag);
  }
  /// To the sessions of these reporters; to all started ones where the list is empty.
  tal_status send(const Message& message, std::uint32_t category, std::uint16_t type,
                  const std::vector<std::int64_t>& reporters, std::uint64_t tag = 0) const noexcept {
    return tal_send(get(), message.get(), category, type, reporters.data(), reporters.size(), tag);
  }

  /// Asks and waits; TAL_TIMED_OUT, TAL_WRONG_THREAD from a callback, or the daemon's error. May throw
  /// bad_alloc.
  Answer<std::uint16_t> serviceType(std::int64_t reporter, std::chrono::milliseconds timeout) const {
    return ask<std::uint16_t>(
        timeout, [](const tal_reply& reply) { return reply.service_type; },
        [&](auto function, void* user) { return tal_look_up_service_type(get(), reporter, function, user); });
  }
  /// The reporter's service type, or TAL_SERVICE_UNKNOWN where the daemon knows no such reporter.
  struct Reporter {
    std::int64_t id;  ///< 0 where there is none.
    std::uint16_t serviceType;
  };
  Answer<Reporter> reporter(std::int64_t id, std::chrono::milliseconds timeout) const {
    return ask<Reporter>(
        timeout,
        [](const tal_reply& reply) {
          return Reporter{reply.valid_id, reply.service_type};
        },
        [&](auto function, void* user) { return tal_look_up_reporter(get(), id, function, user); });
  }
  Answer<std::vector<std::int64_t>> allReporters(std::chrono::milliseconds timeout) const {
    return ask<std::vector<std::int64_t>>(
        timeout,
        [](const tal_reply& reply) {
          return std::vector<std::int64_t>(reply.reporters, reply.reporters + reply.reporter_count);
        },
        [&](auto function, void* user) { return tal_look_up_all_reporters(get(), function, user); });
  }

  tal_status killService() const noexcept { return tal_kill_service(get()); }

  tal_statistics statistics() const noexcept {
    tal_statistics statistics{};
    tal_get_statistics(get(), &statistics, sizeof statistics);
    return statistics;
  }

  /// For the functions of the C header, such as those of single session requests. NULL after it was moved
  /// from.
  tal_connection* get() const noexcept { return shared_ ? shared_->handle : nullptr; }

 private:
  /// Owns the C connection, and the functions that its callbacks call.
  struct Shared {
    explicit Shared(Options given) : options(std::move(given)) {
      tal_options c{};
      c.struct_bytes = sizeof c;
      c.socket_path = options.socketPath.empty() ? nullptr : options.socketPath.c_str();
      c.durable_acknowledgement = options.durableAcknowledgement;
      c.queue_bytes = options.queueBytes;
      c.max_frame_bytes = options.maxFrameBytes;
      c.reconnect_min_ms = milliseconds(options.reconnectMin);
      c.reconnect_max_ms = milliseconds(options.reconnectMax);
      c.poll_interval_ms = milliseconds(options.pollInterval);
      c.callbacks.user = &options;
      if (options.onConnected) {
        c.callbacks.connected = [](void* user, const char* server) noexcept { of(user).onConnected(server); };
      }
      if (options.onDisconnected) {
        c.callbacks.disconnected = [](void* user, const tal_error* why) noexcept {
          of(user).onDisconnected(*why);
        };
      }
      if (options.onReply) {
        c.callbacks.reply = [](void* user, const tal_reply* reply) noexcept { of(user).onReply(*reply); };
      }
      if (options.onError) {
        c.callbacks.error = [](void* user, const tal_error* error) noexcept { of(user).onError(*error); };
      }
      tal_error error{};
      handle = tal_connect(&c, &error);
      if (!handle && error.status == TAL_INVALID) throw std::invalid_argument(error.message);
      if (!handle) throw std::bad_alloc();
    }
    ~Shared() { tal_connection_free(handle); }
    Shared(const Shared&) = delete;
    Shared& operator=(const Shared&) = delete;

    static Options& of(void* user) { return *static_cast<Options*>(user); }

    Options options;
    tal_connection* handle = nullptr;
  };

  static std::uint32_t milliseconds(std::chrono::milliseconds time) noexcept {
    if (time.count() <= 0) return 0;
    return time.count() < UINT32_MAX ? static_cast<std::uint32_t>(time.count()) : UINT32_MAX;
  }

  template <typename Value, typename Read, typename Request>
  Answer<Value> ask(std::chrono::milliseconds timeout, Read read, Request request) const {
    // The library calls the function exactly once, perhaps after the wait was given up: so it owns the
    // promise.
    struct Call {
      std::promise<Answer<Value>> promise;
      Read read;
    };
    Answer<Value> failed;
    if (tal_on_library_thread(get())) {
      failed.error.status = TAL_WRONG_THREAD;
      return failed;
    }
    auto call = std::unique_ptr<Call>(new Call{{}, read});
    auto answer = call->promise.get_future();
    failed.error.status = request(
        [](void* user, const tal_reply* reply) noexcept {
          std::unique_ptr<Call> owned(static_cast<Call*>(user));
          Answer<Value> result;
          if (reply->error) {
            result.error = *reply->error;
          } else {
            result.value = owned->read(*reply);
          }
          owned->promise.set_value(std::move(result));
        },
        call.get());
    if (failed.error.status != TAL_OK) return failed;
    static_cast<void>(call.release());
    if (answer.wait_for(timeout) == std::future_status::ready) return answer.get();
    failed.error.status = TAL_TIMED_OUT;
    return failed;
  }

  std::shared_ptr<Shared> shared_;
};

/// A reporting session of the daemon: opened (created, typed, configured, started) by the constructor,
/// stopped and destroyed by the destructor. Keeps its connection alive. Its functions may be called from any
/// thread.
class Session {
 public:
  /// `status()` tells whether the requests could be queued; nothing here throws.
  Session(Connection connection, std::uint16_t serviceType, const Message* configuration = nullptr,
          std::int64_t reporter = tal_make_reporter_id()) noexcept
      : connection_(std::move(connection)),
        reporter_(reporter),
        status_(tal_session_open(connection_.get(), reporter, serviceType,
                                 configuration ? configuration->get() : nullptr)) {}
  ~Session() { destroy(); }
  /// What was moved from is no session any more: its sends return TAL_CLOSED.
  Session(Session&& other) noexcept = default;
  Session& operator=(Session&& other) noexcept {
    if (this != &other) {
      destroy();
      connection_ = std::move(other.connection_);
      reporter_ = other.reporter_;
      status_ = other.status_;
    }
    return *this;
  }

  tal_status status() const noexcept { return status_; }
  std::int64_t reporter() const noexcept { return reporter_; }

  tal_status send(const Message& message, std::uint32_t category, std::uint16_t type) const noexcept {
    if (!connection_.get()) return TAL_CLOSED;
    return tal_session_send(connection_.get(), reporter_, message.get(), category, type);
  }
  tal_status setConfiguration(const Message& configuration) const noexcept {
    if (!connection_.get()) return TAL_CLOSED;
    return tal_session_set_configuration(connection_.get(), reporter_, configuration.get());
  }
  tal_status start() const noexcept {
    return connection_.get() ? tal_session_start(connection_.get(), reporter_) : TAL_CLOSED;
  }
  tal_status stop() const noexcept {
    return connection_.get() ? tal_session_stop(connection_.get(), reporter_) : TAL_CLOSED;
  }

 private:
  void destroy() noexcept {
    if (connection_.get() && status_ == TAL_OK) tal_session_destroy(connection_.get(), reporter_);
  }

  Connection connection_;
  std::int64_t reporter_;
  tal_status status_;
};

}  // namespace tal::client
