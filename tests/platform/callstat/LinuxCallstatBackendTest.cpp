#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "platform/linux/callstat/LinuxCallstatBackend.h"
#include "platform/linux/callstat/SummaryLimit.h"
#include "platform/store/StoreFixture.h"

namespace tal {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

class LinuxCallstatBackendTest : public test::StoreFixture {
 protected:
  void set(std::string_view key, const MessageValue& value) {
    settings_.setValue("org.vantle.talsys.rtc", key, value);
  }
  /// A daemon begins.
  void open() {
    if (store_) earlier_stores_.push_back(std::move(store_));
    if (backend_) earlier_backends_.push_back(std::move(backend_));
    store_ = std::make_unique<StoreWriter>(StoreWriter::Dependencies{
        .directory = directory_.path(), .settings = settings_, .clock = clock_, .log = log_.service});
    backend_ =
        std::make_unique<LinuxCallstatBackend>(LinuxCallstatBackend::Dependencies{.store = *store_,
                                                                                  .store_path = storePath(),
                                                                                  .settings = settings_,
                                                                                  .clock = clock_,
                                                                                  .log = log_.callstat});
  }
  std::unique_ptr<CallstatSession> startSession(std::int64_t identifier) {
    auto session = backend_->initWithSessionInfo(
        {{"session_identifier", identifier}, {"contains_real_time_events", false}}, {{"u", 1}}, {});
    session->startConfigurationWithCompletionHandler(
        [this](const std::vector<std::string>& backends) { found_ = backends; });
    return session;
  }
  std::vector<std::string> rows(const std::string& columns) {
    store_->flushAndClose();
    return test::OtherProgram(storePath()).query("SELECT " + columns + " FROM rtc_messages ORDER BY id");
  }

  // For sessions that a daemon did not end: closed, they take nothing more.
  std::vector<std::unique_ptr<StoreWriter>> earlier_stores_;
  std::vector<std::unique_ptr<LinuxCallstatBackend>> earlier_backends_;
  std::unique_ptr<StoreWriter> store_;
  std::unique_ptr<LinuxCallstatBackend> backend_;
  std::vector<std::string> found_;
};

TEST_F(LinuxCallstatBackendTest, FindsTheStoreWhereItIsSwitchedOn) {
  open();
  startSession(1);
  EXPECT_THAT(found_, IsEmpty());
  set("store", true);
  startSession(1);
  EXPECT_THAT(found_, ElementsAre("store"));
  set("store", "yes");
  startSession(1);
  startSession(1);
  EXPECT_THAT(found_, IsEmpty());
  EXPECT_EQ(lines_.count("settings org.vantle.talsys.rtc: store not usable"), 1U);
}

TEST_F(LinuxCallstatBackendTest, StoresMessagesWithTheirSessionAlsoAfterARestart) {
  set("store", true);
  open();
  const auto unsent = startSession(11);
  const auto first = startSession(12);
  EXPECT_EQ(first->sendMessage(4, 1, {{"n", 1}}), std::nullopt);
  EXPECT_EQ(first->sendMessage(4, 2, {{"n", 2}}), std::nullopt);
  EXPECT_THAT(rows("session_identifier, category, type, realtime, payload"),
              ElementsAre(R"(12|4|1|0|{"n":1})", R"(12|4|2|0|{"n":2})"));
  open();
  const auto second = startSession(13);
  second->sendMessage(5, 0, {{"n", 3}});
  EXPECT_THAT(rows("session_identifier, user_info"),
              ElementsAre(R"(12|{"u":1})", R"(12|{"u":1})", R"(13|{"u":1})"));
  EXPECT_THAT(test::OtherProgram(storePath())
                  .query("SELECT session_identifier, last_row FROM rtc_sessions ORDER BY id"),
              ElementsAre("12|2", "13|"))
      << "what a daemon left open has ended by the next one's start";
}

TEST_F(LinuxCallstatBackendTest, TokensDifferAndNameTheirParent) {
  open();
  const auto root = backend_->newHierarchyTokenFromParentToken(nullptr);
  const auto other = backend_->newHierarchyTokenFromParentToken(nullptr);
  ASSERT_TRUE(root && other);
  EXPECT_NE(root->text, other->text);
  const auto child = backend_->newHierarchyTokenFromParentToken(&*root);
  EXPECT_THAT(child->text, testing::StartsWith(root->text + '.'));
}

TEST_F(LinuxCallstatBackendTest, ALongSummaryIsStoredCutAndLoggedOnce) {
  set("store", true);
  open();
  const auto session = startSession(12);
  const std::string fits(kMostSummaryValueBytes, 'x');
  session->sendMessage(
      0xFFFF, 0xFFFF,
      {{"TAL_Session_Summary_Event", "7"}, {"fits", fits}, {"a", fits + ",b"}, {"b", fits + 'x'}});
  session->sendMessage(4, 1, {{"a", fits + 'x'}});
  EXPECT_THAT(rows("length(payload ->> '$.a'), payload ->> '$.TAL_Session_Summary_LeftOut'"),
              ElementsAre(R"(65536|{"a":2,"b":1})", "65537|"));
  EXPECT_EQ(lines_.count("is cut to 64 KiB under 2 keys"), 1U);
}

struct Cut {
  const char* name;
  std::string head;
  std::string tail;  // begins where the limit is
  std::size_t kept;
};

class SummaryCut : public testing::TestWithParam<Cut> {};

TEST_P(SummaryCut, KeepsWholeValuesOrCharacters) {
  const Cut& row = GetParam();
  const std::string filler(kMostSummaryValueBytes - row.head.size(), 'y');
  const MessageDict summary{{"k", filler + row.head + row.tail}};
  const LimitedSummary limited = limitSummary(summary);
  EXPECT_EQ(limited.summary.find("k")->string().size(), row.kept);
  EXPECT_EQ(limited.cut_keys, row.tail.empty() ? 0U : 1U);
}

INSTANTIATE_TEST_SUITE_P(Texts, SummaryCut,
                         testing::Values(Cut{"AtTheLimit", "", "", kMostSummaryValueBytes},
                                         Cut{"BeforeAComma", "", ",z", kMostSummaryValueBytes},
                                         Cut{"WithinAValue", ",zz", "z", kMostSummaryValueBytes - 3},
                                         Cut{"AtTheCommaThatFits", ",", "z", kMostSummaryValueBytes - 1},
                                         Cut{"WithinACharacter", "\xE2\x82", "\xAC",
                                             kMostSummaryValueBytes - 2}),
                         [](const auto& row) { return row.param.name; });

}  // namespace
}  // namespace tal
