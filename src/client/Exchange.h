// The requests of a program on their way: written to the socket, waiting for their replies, done.
#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>
#include <functional>
#include <map>
#include <optional>
#include <span>
#include <utility>
#include <vector>

#include "client/Listener.h"
#include "client/Outbox.h"
#include "client/Replies.h"
#include "client/SessionModels.h"
#include "client/SocketStream.h"

namespace tal::clientlib {

/// Carries records from the outbox to the socket. A record's life:
///   1. published by a sender;
///   2. staged: written into the stream's buffer, under a call number;
///   3. done: answered, or, where no answer can be counted on (a start, the end of the service), written;
///   4. released, when all before it are: its room is free, and the session models know of it.
/// When the connection breaks, everything staged is published again, but for messages, look-ups and the end
/// of the service that are done: a session's requests are carried out again with what stands between them.
///
/// Lives on the library's thread.
class Exchange {
 public:
  Exchange(Outbox& outbox, SocketStream& stream, Listener& listener)
      : outbox_(outbox), stream_(stream), listener_(listener) {}

  /// A new connection: sets up the sessions. Calls below `firstCall` are the caller's.
  void begin(std::uint64_t firstCall);
  void connectionBroke();

  /// Stages records until the stream's buffer is full enough.
  void stage();
  /// True when there are records to stage.
  bool hasMore() const;
  /// A request of the library itself. `answered(failed)` is called with its answer, if that comes.
  void sendOwn(tal_operation operation, std::span<const unsigned char> arguments,
               std::function<void(bool failed)> answered = {});
  /// Takes note of what has been written to the socket.
  void noteWritten();
  void handle(const Reply& reply);
  /// The daemon refused a frame for its length and will close the connection: gives up the longest one under
  /// way, which must be too long, lest it be sent for ever.
  void refuseLongest(const tal_error& why);
  /// Releases what is done.
  void release();
  /// Tells every look-up that is not answered that it will not be.
  void abandon();

  std::optional<std::int64_t> firstStartedSession() const { return models_.firstStarted(); }

 private:
  struct UnderWay {
    RecordRing::Record record{};
    bool own = false;
    bool done = false;
    tal_operation operation = TAL_HELLO;
    std::size_t argumentBytes = 0;
    std::function<void(bool)> answered;
  };
  /// A call that may be answered after its record is gone.
  struct LateCall {
    tal_operation operation;
    std::int64_t reporter;
  };

  void stageRecord(const RecordRing::Record& record);
  void finish(UnderWay& request, const Reply& reply);
  void refuse(const RecordRing::Record& record, const tal_error& why);
  void tell(tal_operation operation, const RecordHead& head, const tal_error* error);
  void answerLookUp(const RecordHead& head, tal_operation operation, const Reply& reply);
  void addLateCall(std::uint64_t call, tal_operation operation, std::int64_t reporter);
  void forgetLateCalls(std::int64_t reporter);
  void applyToModels(const RecordRing::Record& record);

  Outbox& outbox_;
  SocketStream& stream_;
  Listener& listener_;
  SessionModels models_;

  RecordRing::Position staged_ = 0;
  /// How far staging ever came: what is staged below it is a repetition.
  RecordRing::Position everStaged_ = 0;
  std::uint64_t firstCall_ = 0;
  /// By call, from firstCall_ on.
  std::deque<UnderWay> underWay_;
  /// Records that are done when the stream has sent so many bytes.
  std::deque<std::pair<std::uint64_t, RecordRing::Record>> doneWhenWritten_;
  /// Nothing follows the end of the service before that is written: it may never be read.
  bool endStaged_ = false;
  std::map<std::uint64_t, LateCall> lateCalls_;
  std::map<std::int64_t, std::vector<std::uint64_t>> lateCallsOfReporter_;
  std::vector<unsigned char> scratch_;
};

}  // namespace tal::clientlib
