#pragma once

// One client's socket: reads it in bounded slices, decodes the requests and
// hands them to the reporting queue in batches.

#include <asio/local/stream_protocol.hpp>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <span>
#include <string_view>

#include "platform/linux/ipc/PeerCredentials.h"
#include "platform/linux/ipc/ReplyChannel.h"
#include "platform/linux/ipc/RequestRunner.h"
#include "service/TalReportingService.h"
#include "wire/FrameSplitter.h"
#include "wire/RequestDecoder.h"

namespace tal {

/// What all connections of one listener share.
struct ConnectionContext {
  TalReportingService& service;
  RunnerContext& runners;
  /// A slice is read into this, and is used up before the next one is read.
  std::span<char> read_buffer;
};

/// Lives on the I/O thread.
///
/// Life:
/// 1. `start`: reads, for as long as there is room for what it reads;
/// 2. the peer has no more to say, or sent a length that cannot be followed, or
///    `drain` was called: nothing is read any more, what was received is carried
///    out;
/// 3. that is done: the service is told that the connection is over;
/// 4. the replies have gone, or nobody takes them: the socket is closed, and
///    `closed` is called.
/// `drain` leaves out 3 and 4: the process ends.
class IpcConnection final : public std::enable_shared_from_this<IpcConnection> {
 public:
  using Socket = asio::local::stream_protocol::socket;

  // What a connection may read before the others have their turn.
  static constexpr std::size_t kReadSliceBytes = std::size_t{64} << 10;

  struct Hooks {
    /// The connection is closed: the last call to any hook.
    std::function<void(const std::shared_ptr<IpcConnection>&)> closed;
    /// After `drain`: what was received has been carried out.
    std::function<void()> drained;
  };

  /// `context` outlives the connection.
  IpcConnection(Socket socket, PeerCredentials peer, std::uint32_t max_frame_bytes,
                ConnectionContext& context, Hooks hooks);

  void start();

  /// Room for reading may have come that this connection did not hear of.
  void readOn();

  /// Takes in what the peer has sent up to now and has it carried out; then calls
  /// `drained`. Replies that the peer does not read are not waited for.
  void drain();

  /// Drops whatever is under way. Calls no hook.
  void abandon();

 private:
  void makeRunner();
  void waitReadable();
  void readSlice();
  /// True when more may be read.
  bool takeIn(std::string_view bytes);
  void takeFrame(std::string_view frame, RequestBatch& batch);
  void endInput();
  void waitWritable();
  void carriedOut();
  void closeWhenAnswered();
  void close();

  Socket socket_;
  const PeerCredentials peer_;
  ConnectionContext& context_;
  const Hooks hooks_;
  std::shared_ptr<TalReportingClientServerInstance> client_;
  std::shared_ptr<ReplyChannel> channel_;
  std::shared_ptr<RequestRunner> runner_;
  FrameSplitter splitter_;
  RequestDecoder decoder_;

  bool waits_readable_ = false;
  bool waits_writable_ = false;
  bool has_room_ = true;  // the runner takes more
  bool input_ended_ = false;
  bool broke_off_ = false;  // in the middle of a frame
  bool peer_gone_ = false;  // and takes no replies either
  bool carried_out_ = false;
  bool settled_ = false;
  bool draining_ = false;
  bool closed_ = false;
};

}  // namespace tal
