#pragma once

// JSON as a message for the client library.

#include "client/talreporting.hpp"
#include "tools/talctl/ArgumentValue.h"

namespace tal::talctl {

/// A message with the entries of `object`. What JSON has no values for is
/// written as an object with one key: {"$date": seconds since 1970} and
/// {"$data": "base64"}. Throws UsageError for anything that no message can hold:
/// no object, null, text that is not UTF-8, nesting too deep.
client::Message buildMessage(const Json& object);

}  // namespace tal::talctl
