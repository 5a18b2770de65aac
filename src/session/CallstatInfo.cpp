#include "session/CallstatInfo.h"

namespace tal {

namespace {

constexpr int kClientTypeTalsys = 19;
// A number, as the back-end wants it: what follows the second dot is left out.
constexpr double kClientVersion = TAL_CLIENT_VERSION;

}  // namespace

MessageDict callstatSessionInfo(ReporterID reporter_id, const CallstatToken& token, bool batched) {
  return {{kCallstatClientType, kClientTypeTalsys},  {kCallstatClientVersion, kClientVersion},
          {kCallstatSessionIdentifier, reporter_id}, {kCallstatBatchEvents, batched},
          {kCallstatHierarchyToken, token.text},     {kCallstatContainsRealTimeEvents, !batched}};
}

MessageDict callstatUserInfo(ReporterID reporter_id, std::string_view service_name) {
  return {{kCallstatClientName, MessageValue::literal(TalReportingClientNameTalsys)},
          {"TalReportingSessionID", reporter_id},
          {kCallstatServiceName, service_name}};
}

}  // namespace tal
