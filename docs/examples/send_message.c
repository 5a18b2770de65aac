/* Sends what a music player would say of one stretch of playing: that it began, at which volume, and that it ended.
 *
 *     cc send_message.c $(pkg-config --cflags --libs talreporting) -o send_message && ./send_message
 */
#include <stdio.h>
#include <talreporting.h>
#include <time.h>

static double now(void) {
  struct timespec time;
  timespec_get(&time, TIME_UTC);
  return (double)time.tv_sec + (double)time.tv_nsec / 1e9;
}

/* Called on the library's thread. */
static void refused(void* user, const tal_reply* reply) {
  (void)user;
  if (reply->error) fprintf(stderr, "send_message: refused: %s\n", reply->error->message);
}

int main(void) {
  tal_options options = TAL_OPTIONS_INIT;
  tal_error error;
  options.callbacks.reply = refused;
  tal_connection* connection = tal_connect(&options, &error);
  if (!connection) {
    fprintf(stderr, "send_message: %s\n", error.message);
    return 1;
  }
  /* Only a program that has nothing else to do waits: messages are kept while the daemon is away. */
  if (tal_wait_connected(connection, 2000, &error) != TAL_OK) {
    fprintf(stderr, "send_message: %s\n", error.message);
    tal_connection_free(connection);
    return 1;
  }

  const int64_t reporter = tal_make_reporter_id();
  tal_message* message = tal_message_new(0);
  tal_message_add_string(message, "HostApplicationDisplayID", "org.example.player");
  tal_session_open(connection, reporter, TAL_SERVICE_LONG_FORM_AUDIO, message);

  tal_message_reset(message);
  tal_message_add_bool(message, "session_output_running", true);
  tal_message_add_double(message, "RvSessionVolume", 0.5);
  tal_message_add_uint(message, "mChannelsPerFrame", 2);
  tal_message_add_uint(message, "stretch_index", 1);
  tal_message_add_double(message, "talreporting_timestamp", now());
  tal_message_begin_array(message, "active_devices");
  tal_message_add_string(message, NULL, "Speakers");
  tal_message_end(message);
  tal_session_send(connection, reporter, message, TAL_CATEGORY_PLAYBACK, TAL_TYPE_START);

  tal_message_reset(message);
  tal_message_add_bool(message, "session_output_running", false);
  tal_message_add_uint(message, "stretch_index", 1);
  tal_message_add_double(message, "talreporting_timestamp", now());
  /* What a send returns counts for its whole message: additions that went wrong show here. */
  const tal_status sent =
      tal_session_send(connection, reporter, message, TAL_CATEGORY_PLAYBACK, TAL_TYPE_STOP);
  if (sent != TAL_OK) fprintf(stderr, "send_message: %s\n", tal_status_text(sent));
  tal_message_free(message);

  tal_session_destroy(connection, reporter);
  const tal_status closed = tal_connection_close(connection, 2000);
  if (closed != TAL_OK) fprintf(stderr, "send_message: %s\n", tal_status_text(closed));
  tal_connection_free(connection);
  return sent == TAL_OK && closed == TAL_OK ? 0 : 1;
}
