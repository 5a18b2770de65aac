// Sends what a music player would say of one stretch of playing: that it began, at which volume, and that it ended.
//
//     c++ -std=c++17 send_message.cpp $(pkg-config --cflags --libs talreporting) -o send_message && ./send_message
#include <chrono>
#include <iostream>
#include <talreporting.hpp>

using namespace std::chrono_literals;

namespace {

double now() {
  return std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
}

}  // namespace

int main() {
  tal::client::Options options;
  // Called on the library's thread.
  options.onReply = [](const tal_reply& reply) {
    if (reply.error) std::cerr << "send_message: refused: " << reply.error->message << '\n';
  };
  const tal::client::Connection connection(std::move(options));
  // Only a program that has nothing else to do waits: messages are kept while the daemon is away.
  tal_error error;
  if (connection.waitConnected(2s, &error) != TAL_OK) {
    std::cerr << "send_message: " << error.message << '\n';
    return 1;
  }

  {
    const tal::client::Message configuration{{"HostApplicationDisplayID", "org.example.player"}};
    const tal::client::Session session(connection, TAL_SERVICE_LONG_FORM_AUDIO, &configuration);
    tal::client::Message start{{"session_output_running", true},
                               {"RvSessionVolume", 0.5},
                               {"mChannelsPerFrame", 2},
                               {"stretch_index", 1},
                               {"talreporting_timestamp", now()}};
    start.addArray("active_devices", [](tal::client::Message& devices) { devices.append("Speakers"); });
    session.send(start, TAL_CATEGORY_PLAYBACK, TAL_TYPE_START);
    session.send({{"session_output_running", false}, {"stretch_index", 1}, {"talreporting_timestamp", now()}},
                 TAL_CATEGORY_PLAYBACK, TAL_TYPE_STOP);
  }  // The session stops here.

  const tal_status closed = connection.close(2s);
  if (closed != TAL_OK) std::cerr << "send_message: " << tal_status_text(closed) << '\n';
  return closed == TAL_OK ? 0 : 1;
}
