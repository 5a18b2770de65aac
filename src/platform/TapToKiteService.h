#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace tal {

/// The part of the product that a bug report is filed against.
struct KiteComponent {
  std::string name;
  std::string version;
  std::int64_t identifier = 0;
};

/// A bug report ("kite") that a person is to look at and to file. What the
/// numbers mean is the bug tracker's affair.
struct KiteDraft {
  std::string title;
  std::string problem_description;
  KiteComponent component;
  int reproducibility = 0;
  int classification = 0;
  /// What is to be collected and attached.
  std::vector<std::string> diagnostic_extension_identifiers;
};

/// Prompts the user to file a bug report.
///
/// Called on the reporting queue: must not block.
class TapToKiteService {
 public:
  /// The reason of a failure; nothing on success.
  using Completion = std::function<void(const std::optional<std::string>& error)>;

  virtual ~TapToKiteService() = default;

  /// Makes the draft and shows it. `process_name` is the program that the report
  /// is about, where it is known; `display_reason` tells the user why he is asked.
  /// `completion` is called once, on any thread.
  virtual void createDraft(KiteDraft draft, std::optional<std::string> process_name,
                           std::string display_reason, Completion completion) = 0;
};

}  // namespace tal
