#include "platform/linux/diagnostic_log/BufferedFile.h"

#include <unistd.h>

#include <cerrno>
#include <cstddef>
#include <system_error>
#include <utility>

namespace tal {

namespace {

// Large enough that the disk is asked rarely, small beside what a daemon holds.
constexpr std::size_t kBufferBytes = std::size_t{256} << 10;

std::string reasonOf(int error) { return std::generic_category().message(error); }

}  // namespace

BufferedFile::BufferedFile(int descriptor) : descriptor_(descriptor) { buffer_.reserve(kBufferBytes); }

BufferedFile::~BufferedFile() {
  if (descriptor_ >= 0) static_cast<void>(close());
}

DiagnosticFile::Error BufferedFile::write(std::string_view bytes) {
  if (failed_) return std::nullopt;  // told already, and the rest would not make the file whole
  if (buffer_.size() + bytes.size() > kBufferBytes) {
    if (Error error = flush()) return error;
  }
  if (bytes.size() > kBufferBytes) return writeAll(bytes);
  buffer_ += bytes;
  return std::nullopt;
}

DiagnosticFile::Error BufferedFile::close() {
  Error error = flush();
  if (::close(std::exchange(descriptor_, -1)) != 0 && !error) error = reasonOf(errno);
  return error;
}

DiagnosticFile::Error BufferedFile::flush() {
  Error error = writeAll(buffer_);
  buffer_.clear();
  return error;
}

DiagnosticFile::Error BufferedFile::writeAll(std::string_view bytes) {
  while (!bytes.empty()) {
    const ssize_t written = ::write(descriptor_, bytes.data(), bytes.size());
    if (written < 0 && errno == EINTR) continue;
    if (written < 0) {
      failed_ = true;
      return reasonOf(errno);
    }
    bytes.remove_prefix(static_cast<std::size_t>(written));
  }
  return std::nullopt;
}

}  // namespace tal
