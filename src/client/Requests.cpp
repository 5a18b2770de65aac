// How requests are laid out in CBOR.
#include "client/Requests.h"

namespace tal::clientlib {

std::size_t writeRequestHead(unsigned char* target, tal_operation operation, std::uint64_t call,
                             std::size_t arguments, std::size_t argumentBytes) {
  CborWriter head(target + kFrameLengthBytes);
  head.array(2 + arguments).number(static_cast<std::uint64_t>(operation)).number(call);
  const std::size_t length = head.bytes().size() + argumentBytes;
  for (std::size_t i = 0; i < kFrameLengthBytes; ++i) {
    target[i] = static_cast<unsigned char>(length >> (8 * i) & 0xFF);
  }
  return kFrameLengthBytes + head.bytes().size();
}

std::size_t argumentCount(tal_operation operation) {
  switch (operation) {
    case TAL_LOOK_UP_ALL_REPORTERS:
    case TAL_KILL_SERVICE:
      return 0;
    case TAL_SET_SERVICE_TYPE:
    case TAL_SET_CONFIGURATION:
      return 2;
    case TAL_SEND_MESSAGE:
      return 4;
    default:
      return 1;
  }
}

}  // namespace tal::clientlib
