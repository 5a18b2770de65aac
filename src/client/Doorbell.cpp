// Wakes the library's thread, at no cost while that is awake.
#include "client/Doorbell.h"

#include <sys/eventfd.h>
#include <unistd.h>

#include <cstdint>
#include <new>

namespace tal::clientlib {

Doorbell::Doorbell(bool silent) : silent_(silent), fd_(eventfd(0, EFD_NONBLOCK | EFD_CLOEXEC)) {
  if (fd_ < 0) throw std::bad_alloc();
}

Doorbell::~Doorbell() { ::close(fd_); }

void Doorbell::ring() const {
  const std::uint64_t one = 1;
  // It fails only when the counter is full, and then the thread is being woken anyway.
  [[maybe_unused]] const auto written = ::write(fd_, &one, sizeof one);
}

void Doorbell::quieten() const {
  std::uint64_t rung;
  [[maybe_unused]] const auto got = ::read(fd_, &rung, sizeof rung);
}

}  // namespace tal::clientlib
