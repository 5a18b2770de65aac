#pragma once

#include <lttng/lttng.h>

#include <string>

namespace tal {

/// One session of the tracer. Every operation answers with an empty text on
/// success, else with the reason.
class Recording {
 public:
  enum class Events { kSignposts, kAll };

  Recording(std::string name, std::string directory)
      : name_(std::move(name)), directory_(std::move(directory)) {}
  Recording(const Recording&) = delete;
  Recording& operator=(const Recording&) = delete;
  /// Takes the session away; what it has recorded by then stays on the disk.
  ~Recording();

  std::string start(Events events);
  /// Returns once everything recorded is on the disk.
  std::string stop();
  /// Needed for a complete trace: the last parts are written now.
  std::string destroy();

 private:
  std::string prepare(lttng_handle& handle, lttng_domain& domain, Events events) const;

  const std::string name_;
  const std::string directory_;
  bool exists_ = false;
};

}  // namespace tal
