#pragma once

#include <sys/mman.h>

#include <cstddef>
#include <new>
#include <utility>

namespace tal {

/// A block of memory from the kernel itself. A burst's back-log is handed back
/// when it is written, where the allocator would keep it for ever.
class ChunkMemory {
 public:
  explicit ChunkMemory(std::size_t bytes) : size_(bytes) {
    void* const memory = ::mmap(nullptr, bytes, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    if (memory == MAP_FAILED) throw std::bad_alloc();
    bytes_ = static_cast<char*>(memory);
  }
  ChunkMemory(ChunkMemory&& other) noexcept
      : bytes_(std::exchange(other.bytes_, nullptr)), size_(std::exchange(other.size_, 0)) {}
  ChunkMemory& operator=(ChunkMemory&& other) noexcept {
    std::swap(bytes_, other.bytes_);
    std::swap(size_, other.size_);
    return *this;
  }
  ~ChunkMemory() {
    if (bytes_) ::munmap(bytes_, size_);
  }

  char* get() const { return bytes_; }
  std::size_t size() const { return size_; }

 private:
  char* bytes_ = nullptr;
  std::size_t size_;
};

}  // namespace tal
