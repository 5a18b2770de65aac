// Whether a connection may be used, in memory that a child process finds empty.
#include "client/LifeFlag.h"

#include <sys/mman.h>
#include <unistd.h>

#include <new>

namespace tal::clientlib {

namespace {

std::size_t pageBytes() { return static_cast<std::size_t>(sysconf(_SC_PAGESIZE)); }

}  // namespace

LifeFlag::LifeFlag() {
  void* page = mmap(nullptr, pageBytes(), PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  if (page == MAP_FAILED) throw std::bad_alloc();
  // Older kernels than 4.14 cannot: there a child is not told apart, which the documentation forbids to rely
  // on.
  madvise(page, pageBytes(), MADV_WIPEONFORK);
  flag_ = new (page) std::atomic<std::uint32_t>(static_cast<std::uint32_t>(State::Open));
}

LifeFlag::~LifeFlag() { munmap(flag_, pageBytes()); }

}  // namespace tal::clientlib
