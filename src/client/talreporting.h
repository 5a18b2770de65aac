/**
 * talreporting.h: the C interface of libtalreporting, for programs that send audio-telemetry messages to
 * talreportingd.
 *
 * A program opens one connection, opens a session on it for each thing that it reports on (an audio stream, a
 * call), and sends messages: small dictionaries under a category and a type. Everything is asynchronous. What
 * a function here does is put one record into the connection's queue; a thread of the library carries the
 * records to the daemon in the order in which they were queued, and tells of replies through callbacks.
 *
 *     tal_connection* connection = tal_connect(NULL, NULL);
 *     int64_t reporter = tal_make_reporter_id();
 *     tal_session_open(connection, reporter, TAL_SERVICE_LONG_FORM_AUDIO, NULL);
 *     tal_message* message = tal_message_new(0);
 *     tal_message_add_bool(message, "session_output_running", true);
 *     tal_message_add_double(message, "RvSessionVolume", 0.5);
 *     tal_session_send(connection, reporter, message, TAL_CATEGORY_PLAYBACK, TAL_TYPE_START);
 *     tal_message_free(message);
 *     tal_session_destroy(connection, reporter);
 *     tal_connection_close(connection, 1000);
 *     tal_connection_free(connection);
 *
 * Threads. A tal_message belongs to one thread at a time. Every function that takes a tal_connection may be
 * called from any thread, from several at once, and from callbacks, except where it says otherwise.
 *
 * Audio threads. tal_send() and tal_session_send() never wait, allocate, throw, take a lock or touch memory
 * that was not made resident beforehand. Neither do the tal_message_put/add functions as long as the message
 * stays 20 bytes below the capacity that it was made with. A send pays one compare-and-swap and one copy of
 * the encoded message; with the building of a message of 12 keys that is about 0.3 microseconds. Only when
 * the library's thread sleeps does it also pay one write to an eventfd to wake it: a system call that never
 * blocks and holds no lock across anything slow, but takes a few microseconds. A thread that must make no
 * system call at all sets tal_options.poll_interval_ms.
 *
 * Delivery. What a send accepted (TAL_OK) stays in the queue until the daemon has answered it. When the
 * connection breaks the library reconnects, sets the sessions up as they stood (create, service type,
 * configuration, start) and sends everything unanswered again, in order: at least once. A message that the
 * daemon had carried out without its answer getting through is therefore doubled. That is the lesser harm: a
 * start or a stop that is missing spoils all figures of its stream, and the window is the few messages in
 * flight at the moment of a crash. A receiver that must tell repeats apart puts a running number into its
 * messages. Two requests are never repeated: tal_kill_service(), and a start, which is part of setting the
 * session up.
 *
 * Bounds. The queue is a fixed number of bytes. When it is full, new messages are turned away and the old
 * ones kept; each message turned away is counted under its reason (tal_statistics). Once the daemon is
 * connected and has taken what was kept, the library sends one message of category Generic, type Error into
 * the first of the started sessions, with the number of messages lost since the last such report: keys
 * "client_dropped_messages" (all), "client_dropped_queue_full", "client_dropped_too_large",
 * "client_dropped_invalid", "client_dropped_refused", all unsigned; "client_reconnects" (unsigned, since
 * tal_connect) and "talreporting_timestamp" (double, seconds since 1970). While losses go on it does so at
 * most every ten seconds. A program without a started session finds the counts in the statistics only.
 *
 * Errors. Functions return a tal_status and never end or stall the program: no exceptions, no SIGPIPE, no
 * output. The library's thread blocks all signals. Nothing wakes up while nothing is sent and the daemon is
 * there.
 *
 * fork(). In a child process a connection of the parent is dead: every function returns TAL_CLOSED; open a
 * connection of its own. tal_connection_free() is safe there and does not disturb the parent.
 */
#ifndef TALREPORTING_H
#define TALREPORTING_H

/* NOLINTBEGIN(modernize-use-using, modernize-deprecated-headers): this is C. */
#include <stdbool.h>
#include <stddef.h>
#include <stdint.h>
#include <string.h>

#if defined(TALREPORTING_BUILD)
#define TAL_API __attribute__((visibility("default")))
#else
#define TAL_API
#endif

#ifdef __cplusplus
extern "C" {
#define TAL_NOEXCEPT noexcept
#else
#define TAL_NOEXCEPT
#endif

/** What became of a call. */
typedef enum tal_status {
  TAL_OK = 0,
  TAL_QUEUE_FULL = 1,    /**< No room in the queue. Nothing was queued. */
  TAL_TOO_LARGE = 2,     /**< Over the frame limit, or larger than the queue could ever hold. */
  TAL_INVALID = 3,       /**< The message or an argument is malformed; see tal_message_status(). */
  TAL_CLOSED = 4,        /**< The connection was closed, or belongs to the parent of this process. */
  TAL_TIMED_OUT = 5,     /**< A waiting call gave up; what it waited for may still happen. */
  TAL_WRONG_THREAD = 6,  /**< A waiting call was made from a callback, where it would wait for itself. */
  TAL_OUT_OF_MEMORY = 7, /**< Memory or another resource of the system is lacking. */
  TAL_REFUSED = 8,       /**< The daemon answered with an error, which tal_error describes. */
  TAL_NOT_CONNECTED = 9, /**< No daemon answers at the socket; the library keeps trying. */
} tal_status;

/** One line of English for a status. Never NULL, never freed. */
TAL_API const char* tal_status_text(tal_status status) TAL_NOEXCEPT;

/** A described failure. Texts end with NUL and are cut to fit. */
typedef struct tal_error {
  tal_status status;
  int64_t code;      /**< The daemon's code when status is TAL_REFUSED, else an errno or 0. */
  char domain[64];   /**< The daemon's domain, such as "org.vantle.talsys.ipc"; else "client" or "system". */
  char message[192]; /**< One line for people. */
} tal_error;

/* ---- Vocabulary -------------------------------------------------------------------------------------------
 */

/** What part of the audio system a message concerns. Other 32-bit values are accepted. */
enum tal_category {
  TAL_CATEGORY_GENERIC = 1,
  TAL_CATEGORY_RECORD = 2,
  TAL_CATEGORY_INPUT = 3,
  TAL_CATEGORY_PLAYBACK = 4,
  TAL_CATEGORY_OUTPUT = 5,
  TAL_CATEGORY_PLAYBACK_AND_RECORD = 6,
  TAL_CATEGORY_IO = 7,
  TAL_CATEGORY_SETUP = 8,
  TAL_CATEGORY_CLIENT_REQUEST = 9,
  TAL_CATEGORY_ROUTE_CHANGE = 10,
  TAL_CATEGORY_ERROR = 11,
  TAL_CATEGORY_DRIVER_STATISTICS = 12,
  TAL_CATEGORY_PERFORMANCE = 13,
  TAL_CATEGORY_VOLUME = 14,
  TAL_CATEGORY_HUDDLE = 15,
  TAL_CATEGORY_HEARING_HEALTH = 16,
  TAL_CATEGORY_EARLET = 17
};

/** What happened. Other 16-bit values are accepted. */
enum tal_type {
  TAL_TYPE_GENERIC = 0,
  TAL_TYPE_START = 1,
  TAL_TYPE_STOP = 2,
  TAL_TYPE_ACTIVATE = 3,
  TAL_TYPE_DEACTIVATE = 4,
  TAL_TYPE_SETUP = 5,
  TAL_TYPE_ERROR = 6,
  TAL_TYPE_ISSUE_DETECTOR = 7,
  TAL_TYPE_ENERGY_LOG = 8,
  TAL_TYPE_AUDIO_UNIT_USAGE = 9,
  TAL_TYPE_MIDI_DRIVER = 10,
  TAL_TYPE_SUMMARY = 11,
  TAL_TYPE_HEADPHONE_AUDIO_EXPOSURE = 12,
  TAL_TYPE_AUDIO_EXPOSURE = 13,
  TAL_TYPE_LISTENING_ENHANCEMENT = 14,
  TAL_TYPE_PERCEPT = 15,
  TAL_TYPE_SIMPLE = 16,
  TAL_TYPE_HISTOGRAM = 17,
  TAL_TYPE_STATE = 18,
  TAL_TYPE_MEMORY_LOG = 19
};

/** What kind of client a session serves. The daemon chooses the session's workers by it. */
enum tal_service {
  TAL_SERVICE_GENERIC = 0,
  TAL_SERVICE_VOXA = 1,
  TAL_SERVICE_TELEPHONY = 2,
  TAL_SERVICE_HAPTICS = 3,
  TAL_SERVICE_ALARMS = 4,
  TAL_SERVICE_STANDALONE = 5,
  TAL_SERVICE_SOUND_AUTO_CONFIG = 6,
  TAL_SERVICE_LONG_FORM_AUDIO = 7,
  TAL_SERVICE_NON_LONG_FORM_AUDIO = 8,
  TAL_SERVICE_AUDIO_DEVICE_USAGE = 9,
  TAL_SERVICE_ALERTS = 10,
  TAL_SERVICE_TEST = 11,
  TAL_SERVICE_API_USAGE = 12,
  TAL_SERVICE_SYSTEM_SOUNDS = 13,
  TAL_SERVICE_UNKNOWN = 65535
};

/** The requests, by the numbers that they bear on the wire. */
typedef enum tal_operation {
  TAL_HELLO = 0,
  TAL_CREATE_SESSION = 1,
  TAL_SET_SERVICE_TYPE = 2,
  TAL_LOOK_UP_SERVICE_TYPE = 3,
  TAL_SET_CONFIGURATION = 4,
  TAL_START_SESSION = 5,
  TAL_SEND_MESSAGE = 6,
  TAL_STOP_SESSION = 7,
  TAL_DESTROY_SESSION = 8,
  TAL_LOOK_UP_REPORTER = 9,
  TAL_LOOK_UP_ALL_REPORTERS = 10,
  TAL_KILL_SERVICE = 11
} tal_operation;

/* ---- Messages ---------------------------------------------------------------------------------------------
 */

/**
 * A dictionary under construction, encoded as it grows. It can be sent any number of times, to any
 * connection, and be reset for the next one; reset keeps the memory.
 *
 * A mistake (text that is not UTF-8, a key where an array wants none, nesting beyond TAL_MAX_NESTING, an end
 * without a begin, no memory) spoils the message until it is reset: later additions do nothing, and a send
 * returns TAL_INVALID or TAL_OUT_OF_MEMORY. So it is enough to look at what the send returns.
 *
 * Keys: UTF-8, unique within their map; of a key that stands twice the last one counts. Inside an array the
 * key is NULL. Inside a map it is not.
 */
typedef struct tal_message tal_message;

/** How deep maps and arrays may nest, the message itself included. */
#define TAL_MAX_NESTING 31

/**
 * A new, empty message with room for `capacity` bytes (0: a default of 1,024, enough for about 24 keys). It
 * allocates again only when it outgrows that. NULL when memory is lacking. Free it with tal_message_free().
 */
TAL_API tal_message* tal_message_new(size_t capacity) TAL_NOEXCEPT;
TAL_API void tal_message_free(tal_message* message) TAL_NOEXCEPT;
/** Makes it empty and sound again. */
TAL_API void tal_message_reset(tal_message* message) TAL_NOEXCEPT;
/** TAL_OK, or what spoiled it. A map or array left open is TAL_INVALID. */
TAL_API tal_status tal_message_status(const tal_message* message) TAL_NOEXCEPT;
/** Size of what it holds so far, in bytes as encoded. */
TAL_API size_t tal_message_bytes(const tal_message* message) TAL_NOEXCEPT;

/* Additions. `key` is `key_bytes` long and needs no NUL; it is copied, as are all values. */
TAL_API void tal_message_put_string(tal_message* message, const char* key, size_t key_bytes,
                                    const char* value, size_t value_bytes) TAL_NOEXCEPT;
TAL_API void tal_message_put_int(tal_message* message, const char* key, size_t key_bytes,
                                 int64_t value) TAL_NOEXCEPT;
TAL_API void tal_message_put_uint(tal_message* message, const char* key, size_t key_bytes,
                                  uint64_t value) TAL_NOEXCEPT;
TAL_API void tal_message_put_double(tal_message* message, const char* key, size_t key_bytes,
                                    double value) TAL_NOEXCEPT;
TAL_API void tal_message_put_bool(tal_message* message, const char* key, size_t key_bytes,
                                  bool value) TAL_NOEXCEPT;
/** A date, in seconds since 1970-01-01 00:00 UTC. */
TAL_API void tal_message_put_date(tal_message* message, const char* key, size_t key_bytes,
                                  double seconds) TAL_NOEXCEPT;
TAL_API void tal_message_put_data(tal_message* message, const char* key, size_t key_bytes, const void* value,
                                  size_t value_bytes) TAL_NOEXCEPT;
/** Opens a nested map or array; what is added goes into it until tal_message_end(). */
TAL_API void tal_message_put_map(tal_message* message, const char* key, size_t key_bytes) TAL_NOEXCEPT;
TAL_API void tal_message_put_array(tal_message* message, const char* key, size_t key_bytes) TAL_NOEXCEPT;
TAL_API void tal_message_end(tal_message* message) TAL_NOEXCEPT;

/* The same for text that ends with NUL; the compiler counts a literal. */
static inline void tal_message_add_string(tal_message* message, const char* key, const char* value) {
  tal_message_put_string(message, key, key ? strlen(key) : 0, value, value ? strlen(value) : 0);
}
static inline void tal_message_add_int(tal_message* message, const char* key, int64_t value) {
  tal_message_put_int(message, key, key ? strlen(key) : 0, value);
}
static inline void tal_message_add_uint(tal_message* message, const char* key, uint64_t value) {
  tal_message_put_uint(message, key, key ? strlen(key) : 0, value);
}
static inline void tal_message_add_double(tal_message* message, const char* key, double value) {
  tal_message_put_double(message, key, key ? strlen(key) : 0, value);
}
static inline void tal_message_add_bool(tal_message* message, const char* key, bool value) {
  tal_message_put_bool(message, key, key ? strlen(key) : 0, value);
}
static inline void tal_message_add_date(tal_message* message, const char* key, double seconds) {
  tal_message_put_date(message, key, key ? strlen(key) : 0, seconds);
}
static inline void tal_message_add_data(tal_message* message, const char* key, const void* value,
                                        size_t bytes) {
  tal_message_put_data(message, key, key ? strlen(key) : 0, value, bytes);
}
static inline void tal_message_begin_map(tal_message* message, const char* key) {
  tal_message_put_map(message, key, key ? strlen(key) : 0);
}
static inline void tal_message_begin_array(tal_message* message, const char* key) {
  tal_message_put_array(message, key, key ? strlen(key) : 0);
}

/* ---- Connections ------------------------------------------------------------------------------------------
 */

typedef struct tal_connection tal_connection;

/** An answer of the daemon. Valid during the callback only. */
typedef struct tal_reply {
  tal_operation operation; /**< What was asked. */
  int64_t reporter_id;     /**< Of which reporter; 0 where the request names none or several. */
  uint64_t tag;            /**< TAL_SEND_MESSAGE: what the caller gave to tal_send(). */
  const tal_error* error;  /**< NULL on success. What follows holds on success only. */
  uint16_t
      service_type; /**< The two look-ups of a reporter; TAL_SERVICE_UNKNOWN where there is no such one. */
  int64_t valid_id; /**< TAL_LOOK_UP_REPORTER: the reporter's ID, or 0 where there is no such one. */
  const int64_t* reporters; /**< TAL_LOOK_UP_ALL_REPORTERS: `reporter_count` of them. */
  size_t reporter_count;
} tal_reply;

/** Told of the answer to one request; see the functions that take one. */
typedef void (*tal_reply_function)(void* user, const tal_reply* reply);

/**
 * What a program may want to be told, each NULL where it does not. All are called on the library's thread,
 * one at a time: they should be quick, since nothing is sent meanwhile, and must not throw. They may call
 * everything here but the functions that wait.
 */
typedef struct tal_callbacks {
  void* user; /**< Handed to each of them. Must live until tal_connection_free() has returned. */
  /** The daemon is there, and the sessions are about to be set up. `server` is its name and version. */
  void (*connected)(void* user, const char* server);
  /** A connection that had been told of has ended; the library tries to reconnect. */
  void (*disconnected)(void* user, const tal_error* why);
  /**
   * An answer to a session's request, to a message, or to tal_kill_service(). They need not come in the order
   * of the requests. The answer to a start comes when the session is stopped or started again, so perhaps
   * never, and twice for a test session on an internal build. Requests that the library makes by itself are
   * not told of.
   */
  void (*reply)(void* user, const tal_reply* reply);
  /**
   * Anything that fits none of the above: no daemon at the socket (told once, until that changes), not
   * permitted, an error that answers no request, a reply that makes no sense.
   */
  void (*error)(void* user, const tal_error* error);
} tal_callbacks;

/** How to connect. Set it up with TAL_OPTIONS_INIT; zero means the default everywhere. */
typedef struct tal_options {
  size_t struct_bytes; /**< sizeof(tal_options), so that fields can be added. */
  /**
   * Path of the daemon's socket. NULL: the environment's TALREPORTING_SOCKET, else
   * $XDG_RUNTIME_DIR/talreporting/talreporting.sock, and where nobody answers there
   * /run/talreporting/talreporting.sock. Looked up anew at each attempt; the environment is read by
   * tal_connect().
   */
  const char* socket_path;
  tal_callbacks callbacks;
  /** Ask for answers to messages only once what they caused is committed to the daemon's store. */
  bool durable_acknowledgement;
  /** Size of the queue: 65,536 to 1 GiB, rounded up to a power of two. Default 2 MiB. Resident from the
   * start. */
  size_t queue_bytes;
  /**
   * The largest frame to send. Default 1,048,576, which is also the daemon's default. Where the daemon turns
   * out to allow less, the library adopts its limit step by step: the message that showed it counts as
   * refused.
   */
  size_t max_frame_bytes;
  /** Pauses between attempts to connect: the first about this long (default 100), doubling, each shortened by
   * a random part of up to one half, ... */
  uint32_t reconnect_min_ms;
  /** ... up to this (default 30,000). */
  uint32_t reconnect_max_ms;
  /**
   * 0 (default): a send wakes the library's thread when that sleeps. Else sends make no system call at all,
   * and the thread looks into the queue this often: it then wakes up also while nothing happens, and messages
   * wait that long.
   */
  uint32_t poll_interval_ms;
} tal_options;

#define TAL_OPTIONS_INIT \
  { .struct_bytes = sizeof(tal_options) }

/**
 * Opens a connection and returns at once; the library's thread connects, and keeps trying. `options` may be
 * NULL, and is copied. NULL, with the reason in `error` where that is not NULL, only when an option is out of
 * range (TAL_INVALID) or memory or threads are lacking (TAL_OUT_OF_MEMORY).
 */
TAL_API tal_connection* tal_connect(const tal_options* options, tal_error* error) TAL_NOEXCEPT;

/**
 * Waits until the daemon is connected. TAL_OK, or TAL_NOT_CONNECTED after `timeout_ms` with the latest reason
 * in `error` (may be NULL); TAL_REFUSED at once where the daemon does not admit this user or version;
 * TAL_CLOSED; TAL_WRONG_THREAD.
 */
TAL_API tal_status tal_wait_connected(tal_connection* connection, uint32_t timeout_ms,
                                      tal_error* error) TAL_NOEXCEPT;

/**
 * Waits until everything that was queued before the call has been written and answered (starts need no
 * answer). TAL_OK, TAL_TIMED_OUT, TAL_CLOSED, TAL_WRONG_THREAD. It says nothing about how it was answered.
 */
TAL_API tal_status tal_flush(tal_connection* connection, uint32_t timeout_ms) TAL_NOEXCEPT;

/**
 * Takes no more requests (they return TAL_CLOSED from now on), waits up to `timeout_ms` until what is queued
 * has been answered, then ends the connection and the thread; a running callback is waited for, and after the
 * return none is called any more. The daemon stops the sessions that are still started. TAL_OK, or
 * TAL_TIMED_OUT when something was left behind, which tal_statistics counts. From a callback it never waits:
 * TAL_WRONG_THREAD, with the connection ended behind the callback all the same. A second call does nothing.
 */
TAL_API tal_status tal_connection_close(tal_connection* connection, uint32_t timeout_ms) TAL_NOEXCEPT;

/**
 * Frees the connection, closing it without waiting if that was not done. No other thread may be inside a call
 * with it or make one later: close it first where threads still send, and free it when they are done. NULL is
 * allowed, as is a call from a callback.
 */
TAL_API void tal_connection_free(tal_connection* connection) TAL_NOEXCEPT;

/** True on the library's thread, that is inside a callback of this connection, where nothing may wait. */
TAL_API bool tal_on_library_thread(const tal_connection* connection) TAL_NOEXCEPT;

/* ---- Sessions ---------------------------------------------------------------------------------------------
 */

/* A session is named by its reporter ID, chosen by the program: any number but 0, unique among its own, best
 * among all. Each function queues one request and returns TAL_OK, TAL_QUEUE_FULL, TAL_TOO_LARGE, TAL_INVALID
 * (reporter ID 0, or a spoiled configuration) or TAL_CLOSED. A part of the queue is kept free for them. They
 * may allocate. */

/** A random positive reporter ID. */
TAL_API int64_t tal_make_reporter_id(void) TAL_NOEXCEPT;

TAL_API tal_status tal_session_create(tal_connection* connection, int64_t reporter_id) TAL_NOEXCEPT;
/** Another type than before makes a started session a stopped one, which must be started again. */
TAL_API tal_status tal_session_set_service_type(tal_connection* connection, int64_t reporter_id,
                                                uint16_t service_type) TAL_NOEXCEPT;
/** Adds entries to the session's configuration, such as "HostApplicationDisplayID"; NULL adds none. */
TAL_API tal_status tal_session_set_configuration(tal_connection* connection, int64_t reporter_id,
                                                 const tal_message* configuration) TAL_NOEXCEPT;
TAL_API tal_status tal_session_start(tal_connection* connection, int64_t reporter_id) TAL_NOEXCEPT;
TAL_API tal_status tal_session_stop(tal_connection* connection, int64_t reporter_id) TAL_NOEXCEPT;
/** Stops it too where it is started. Never fails for want of room: then it is carried out as soon as there
 * is. */
TAL_API tal_status tal_session_destroy(tal_connection* connection, int64_t reporter_id) TAL_NOEXCEPT;

/** Create, service type, configuration (may be NULL) and start: all of them or, on a failure, none. */
TAL_API tal_status tal_session_open(tal_connection* connection, int64_t reporter_id, uint16_t service_type,
                                    const tal_message* configuration) TAL_NOEXCEPT;

/* ---- Sending ----------------------------------------------------------------------------------------------
 */

/**
 * Sends a message to one session. TAL_OK: it is queued. TAL_QUEUE_FULL, TAL_TOO_LARGE, TAL_INVALID,
 * TAL_OUT_OF_MEMORY (the message lacked it) or TAL_CLOSED: it is lost, and counted.
 */
TAL_API tal_status tal_session_send(tal_connection* connection, int64_t reporter_id,
                                    const tal_message* message, uint32_t category,
                                    uint16_t type) TAL_NOEXCEPT;

/**
 * Sends a message to several sessions, this program's or others'. With `reporter_count` 0 it goes to all
 * started sessions of all programs, or to a session of the daemon's own where there are none. At most
 * TAL_MAX_REPORTERS at once (TAL_INVALID). `tag` comes back in the reply and means nothing else.
 */
TAL_API tal_status tal_send(tal_connection* connection, const tal_message* message, uint32_t category,
                            uint16_t type, const int64_t* reporter_ids, size_t reporter_count,
                            uint64_t tag) TAL_NOEXCEPT;

#define TAL_MAX_REPORTERS 1024

/* ---- Asking -----------------------------------------------------------------------------------------------
 */

/* Each returns as the functions of sessions do. After TAL_OK `function` is called exactly once on the
 * library's thread, with the answer or, when the connection is closed before there is one, with an error of
 * status TAL_CLOSED. A repeated answer (reporter 0) is told of once. */

TAL_API tal_status tal_look_up_service_type(tal_connection* connection, int64_t reporter_id,
                                            tal_reply_function function, void* user) TAL_NOEXCEPT;
TAL_API tal_status tal_look_up_reporter(tal_connection* connection, int64_t reporter_id,
                                        tal_reply_function function, void* user) TAL_NOEXCEPT;
TAL_API tal_status tal_look_up_all_reporters(tal_connection* connection, tal_reply_function function,
                                             void* user) TAL_NOEXCEPT;

/**
 * Ends the daemon's process, where this user may. Queued like the rest, sent at most once, and answered only
 * when it is refused (callbacks.reply). tal_flush() returns when it has been written.
 */
TAL_API tal_status tal_kill_service(tal_connection* connection) TAL_NOEXCEPT;

/* ---- Signposts --------------------------------------------------------------------------------------------
 */

/*
 * A signpost says when a piece of work began and when it ended; performance traces of test sessions time it.
 * It needs no connection. Both functions may be called from any thread at any time and never wait, lock or
 * allocate; begin and end of one piece belong to one thread, and may nest. While nothing is recorded they
 * cost about a nanosecond. `subsystem` is "org.vantle.audio" for what is to be timed.
 *
 * Recording needs the tracer, which starts threads of its own in the program. It is therefore loaded on
 * demand alone: by talreporting_signpost_enable(), or, before main() begins, where the environment variable
 * TALREPORTING_SIGNPOSTS is 1.
 */

/** Loads the tracer, once; may take seconds. TAL_OUT_OF_MEMORY where it is not installed. */
TAL_API tal_status talreporting_signpost_enable(void) TAL_NOEXCEPT;

TAL_API void talreporting_signpost_begin(const char* subsystem, const char* name) TAL_NOEXCEPT;
TAL_API void talreporting_signpost_end(const char* subsystem, const char* name) TAL_NOEXCEPT;

/* ---- Statistics -------------------------------------------------------------------------------------------
 */

/** Counts since tal_connect(), in messages where nothing else is said. Read one by one, not at one instant.
 */
typedef struct tal_statistics {
  bool connected;
  uint64_t accepted;           /**< Sends that returned TAL_OK. */
  uint64_t written;            /**< Handed to the socket; a message sent again counts again. */
  uint64_t resent;             /**< Of these, sent again after a connection broke. */
  uint64_t answered;           /**< Taken in by the daemon. */
  uint64_t dropped_queue_full; /**< Turned away by reason; see tal_session_send(). */
  uint64_t dropped_too_large;
  uint64_t dropped_invalid;
  uint64_t dropped_closed;     /**< Sent after the close, ... */
  uint64_t dropped_unanswered; /**< ... and queued before it, but not answered by the end of its time. */
  uint64_t dropped_refused;    /**< Answered with an error. */
  uint64_t connects;           /**< How often a daemon was connected; reconnects are all but the first. */
  uint64_t failed_attempts;    /**< How often connecting failed. */
  uint64_t ignored_replies;    /**< Repeated ones and such as answer nothing. */
  uint64_t queue_used_bytes;   /**< Waiting to be written or answered, requests of all kinds. */
  uint64_t queue_bytes;        /**< Size of the queue. */
} tal_statistics;

/** Fills in the first `struct_bytes` (sizeof(tal_statistics)) bytes. Also after the close. */
TAL_API void tal_get_statistics(const tal_connection* connection, tal_statistics* statistics,
                                size_t struct_bytes) TAL_NOEXCEPT;

#ifdef __cplusplus
} /* extern "C" */
#endif

/* NOLINTEND(modernize-use-using, modernize-deprecated-headers) */
#endif /* TALREPORTING_H */
