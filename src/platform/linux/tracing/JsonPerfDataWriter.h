#pragma once

// Performance data as JSON.

#include <string>

#include "platform/PerfDataWriter.h"

namespace tal {

/// A file is one object: "version", "name", the key variables, "host", "kernel",
/// "cpu_model", "total_time" where there is one, and "metrics". One metric a line.
class JsonPerfDataWriters final : public PerfDataWriters {
 public:
  std::unique_ptr<PerfDataWriter> makeWriter(ResultsDirectory& directory, std::string file_name,
                                             int results_version, std::string perf_data_name) override;
};

}  // namespace tal
