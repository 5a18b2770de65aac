#pragma once

#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "platform/TapToKiteService.h"

namespace tal::test {

/// Keeps the drafts, and answers each at once with `error`.
class FakeTapToKiteService final : public TapToKiteService {
 public:
  struct Created {
    KiteDraft draft;
    std::optional<std::string> process_name;
    std::string display_reason;
  };

  void createDraft(KiteDraft draft, std::optional<std::string> process_name, std::string display_reason,
                   Completion completion) override {
    drafts.push_back({std::move(draft), std::move(process_name), std::move(display_reason)});
    completion(error);
  }

  std::optional<std::string> error;
  std::vector<Created> drafts;
};

}  // namespace tal::test
