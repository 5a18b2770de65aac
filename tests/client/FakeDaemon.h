// A daemon that does what the test tells it, one step at a time, on the test's own thread.
#pragma once

#include <cstdint>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "client/talreporting.h"

namespace tal::test {

/// A request as it arrived: "6({"a": 1}, 4, 1, [7])" says it all but for the call.
struct Request {
  std::uint64_t operation = 0;
  std::uint64_t call = 0;
  /// In diagnostic notation.
  std::string text;
};

/// One connection that the daemon accepted. Waits end with a failure after eight seconds.
class FakePeer {
 public:
  explicit FakePeer(int fd) : fd_(fd) {}
  ~FakePeer() { close(); }
  FakePeer(const FakePeer&) = delete;
  FakePeer& operator=(const FakePeer&) = delete;

  /// The next request. Throws where none comes or the client closes.
  Request next();
  /// The texts of the next requests, each answered with `true` or, for messages, null. Starts are not
  /// answered.
  std::vector<std::string> serve(std::size_t requests);
  /// Takes the hello and answers it.
  void greet();
  /// Reads over everything until the client closes.
  void awaitEnd() const;

  /// `result` is CBOR.
  void reply(std::uint64_t call, const std::string& result = "\xF5") const;
  /// The frame of such a reply, for several in one piece.
  static std::string success(std::uint64_t call, const std::string& result);
  void replyError(std::uint64_t call, std::uint8_t code,
                  const std::string& domain = "org.vantle.talsys.ipc") const;
  void sendRaw(const std::string& bytes) const;
  void close();

 private:
  static std::string frame(std::uint64_t call, const std::string& rest);
  bool fill(std::string& bytes, std::size_t size) const;

  int fd_;
};

/// The place where the daemon listens, in a temporary directory of its own.
class FakeDaemon {
 public:
  FakeDaemon();
  ~FakeDaemon();
  FakeDaemon(const FakeDaemon&) = delete;
  FakeDaemon& operator=(const FakeDaemon&) = delete;

  const std::string& path() const { return path_; }
  void listen();
  /// Nobody is there any more; connections stay.
  void leave();
  std::unique_ptr<FakePeer> accept() const;
  /// Accepts and greets.
  std::unique_ptr<FakePeer> welcome() const;

 private:
  std::filesystem::path directory_;
  std::string path_;
  int fd_ = -1;
};

}  // namespace tal::test
