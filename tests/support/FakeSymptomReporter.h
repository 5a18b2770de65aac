#pragma once

#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "platform/SymptomReporterService.h"

namespace tal::test {

/// Keeps every request of every client that it made; the test answers them.
class FakeSymptomReporter final : public SymptomReporterFactory {
 public:
  struct Asked {
    std::size_t client;  ///< from 0, in the order in which they were made
    bool is_snapshot;
    SymptomReporterService::Request request;
  };
  struct Cancelled {
    std::size_t client;
    std::string identifier;
  };

  std::shared_ptr<SymptomReporterService> makeClient(SymptomContext context) override {
    contexts.push_back(std::move(context));
    return std::make_shared<Client>(*this, contexts.size() - 1);
  }

  /// Answers the request made last.
  void answer(const std::optional<MessageDict>& response) { asked.back().request.reply(response); }

  bool accepts = true;
  std::vector<SymptomContext> contexts;  // one for each client made
  std::vector<Asked> asked;
  std::vector<Cancelled> cancelled;

 private:
  class Client final : public SymptomReporterService {
   public:
    Client(FakeSymptomReporter& fake, std::size_t number) : fake_(fake), number_(number) {}
    Signature signatureWithDomain(const SignatureFields& fields) override {
      std::string text;
      for (const auto part :
           {fields.domain, fields.type, fields.sub_type, fields.subtype_context, fields.detected_process}) {
        text += text.empty() ? "" : "/";
        text += part;
      }
      return {{"signature", text}};
    }
    bool snapshotWithSignature(Request request) override { return record(true, std::move(request)); }
    bool startSessionWithSignature(Request request) override { return record(false, std::move(request)); }
    void cancelSession(std::string_view identifier) override {
      fake_.cancelled.push_back({number_, std::string(identifier)});
    }

   private:
    bool record(bool is_snapshot, Request request) {
      fake_.asked.push_back({number_, is_snapshot, std::move(request)});
      return fake_.accepts;
    }
    FakeSymptomReporter& fake_;
    const std::size_t number_;
  };
};

}  // namespace tal::test
