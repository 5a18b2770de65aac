#include <gtest/gtest.h>

#include <string>

#include "wire/Hex.h"
#include "wire/ReplyEncoder.h"

namespace tal {
namespace {

TEST(ReplyEncoder, WritesWholeFramesOneBehindTheOther) {
  std::string out;
  ReplyEncoder replies(out);
  replies.null(1);
  replies.boolean(300, true);
  replies.serviceType(2, AudioServiceType::kUnknown);
  const ReporterID ids[] = {7, -1};
  replies.reporterIDs(3, ids);
  replies.dict(4, MessageDict{{"reporterID", 7}, {"serviceType", 65535}});
  replies.hello(5, "talreportingd 1.2.3");
  EXPECT_EQ(toHex(out),
            toHex(hex("04000000 83 01 00 F6"
                      "06000000 83 19 01 2C 00 F5"
                      "06000000 83 02 00 19 FF FF"
                      "06000000 83 03 00 82 07 20"
                      "1F000000 83 04 00 A2 6A 'reporterID' 07 6B 'serviceType' 19 FF FF"
                      "28000000 83 05 00 A2 67 'version' 01 66 'server' 73 'talreportingd 1.2.3'")));
}

TEST(ReplyEncoder, TellsErrorsByDomainCodeAndText) {
  std::string out;
  ReplyEncoder replies(out);
  replies.error(9, WireErrorCode::kKeepsTooMuch, "full");
  replies.reportingDisabled(0);
  EXPECT_EQ(toHex(out),
            toHex(hex("34000000 83 09 01 A3 66 'domain' 75 'org.vantle.talsys.ipc' 64 'code' 07"
                      "67 'message' 64 'full'"
                      "4B000000 83 00 01 A3 66 'domain' 78 1A 'org.vantle.audio.reporting' 64 'code' 01"
                      "67 'message' 75 'reporting is disabled'")));
}

}  // namespace
}  // namespace tal
