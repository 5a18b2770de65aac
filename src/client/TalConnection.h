// A connection as the C interface hands it out: what the program's threads and the library's share.
#pragma once

#include <pthread.h>

#include <atomic>
#include <cstdint>
#include <mutex>

#include "client/Courier.h"
#include "client/Outbox.h"
#include "client/Progress.h"
#include "client/talreporting.h"

/// Owned by the program, but for a connection that is freed in a callback: that one owns itself, and its
/// thread deletes it.
struct tal_connection {
  /// Takes complete options. Throws std::bad_alloc.
  explicit tal_connection(const tal_options& options);

  bool foreign() const { return outbox.life.get() == tal::clientlib::LifeFlag::State::Foreign; }
  /// The thread itself notes who it is: it can be in a callback before the one that made it knows.
  bool onThread() const { return self.load(std::memory_order_relaxed) == pthread_self(); }

  /// False where the system has no thread to give.
  bool start();
  /// Ends the thread; whoever comes second waits for whoever was first.
  void finish(std::uint32_t timeoutMs);

  tal::clientlib::Outbox outbox;
  tal::clientlib::Progress progress;
  tal::clientlib::Courier courier;
  pthread_t thread{};
  std::atomic<pthread_t> self{};
  std::mutex finishing;
  bool finished = false;
  /// Only touched on the thread.
  bool freedInCallback = false;

 private:
  static void* threadMain(void* argument);
};
