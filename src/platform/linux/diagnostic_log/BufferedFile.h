#pragma once

// A file of diagnostics on its way to the disk.

#include <string>
#include <string_view>

#include "platform/DiagnosticLog.h"

namespace tal {

/// Takes over the descriptor of a file that was opened for writing.
class BufferedFile final : public DiagnosticFile {
 public:
  explicit BufferedFile(int descriptor);
  BufferedFile(const BufferedFile&) = delete;
  BufferedFile& operator=(const BufferedFile&) = delete;
  ~BufferedFile() override;

  Error write(std::string_view bytes) override;
  Error close() override;

 private:
  Error flush();
  Error writeAll(std::string_view bytes);

  int descriptor_;
  std::string buffer_;
  bool failed_ = false;
};

}  // namespace tal
