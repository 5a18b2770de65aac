#pragma once

// Categories, types and services by number or by name, as a person types them.
// Names are those under which events are stored; case does not matter.

#include <cstdint>
#include <string_view>

#include "core/EventVocabulary.h"

namespace tal::talctl {

/// "4", "0x10000004", "Playback", "DSP_Playback". Throws UsageError.
AudioEventCategory parseCategory(std::string_view text);

/// "1", "Start". Throws UsageError.
AudioEventType parseType(std::string_view text);

/// "7", "longformaudio". Throws UsageError.
AudioServiceType parseService(std::string_view text);

}  // namespace tal::talctl
