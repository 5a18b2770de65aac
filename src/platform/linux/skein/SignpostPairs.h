#pragma once

#include "platform/linux/skein/TraceContent.h"

namespace tal {

/// Pairs each end with the last open begin of its thread, subsystem and name, so
/// that pairs of one name may nest.
class SignpostPairs final : public SkeinSignpostModel {
 public:
  explicit SignpostPairs(const TraceContent& trace);

  const std::vector<SkeinSignpost>& signposts() const override { return signposts_; }
  std::uint64_t unpairedCount() const override { return unpaired_; }

 private:
  std::vector<SkeinSignpost> signposts_;
  std::uint64_t unpaired_ = 0;
};

}  // namespace tal
