#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "platform/linux/store/Retention.h"

namespace tal {
namespace {

using Action = RetentionStep::Action;

constexpr double kNow = 1'000'000;
constexpr RetentionLimits kLimits{.most_age = std::chrono::seconds(1000), .most_bytes = 100'000'000};
constexpr double kOldestKept = kNow - 1000;
constexpr TableSpan kEvents{
    .table = StoreTable::kEvents, .first_id = 11, .last_id = 100010, .first_recorded_at = kNow - 50};
constexpr TableSpan kMetrics{
    .table = StoreTable::kMetrics, .first_id = 1, .last_id = 100000, .first_recorded_at = kNow - 90};

TableSpan recordedAt(TableSpan span, double time) {
  span.first_recorded_at = time;
  return span;
}

struct Row {
  std::string name;
  std::vector<TableSpan> tables;
  std::int64_t used_bytes;
  std::int64_t free_bytes;
  Action action;
  StoreTable table = StoreTable::kEvents;
  std::int64_t through_id = 0;
};

class NextRetentionStep : public testing::TestWithParam<Row> {};

TEST_P(NextRetentionStep, Is) {
  const Row& row = GetParam();
  const RetentionStep step = nextRetentionStep({.now = kNow,
                                                .used_bytes = row.used_bytes,
                                                .free_bytes = row.free_bytes,
                                                .log_bytes = 8'000'000,
                                                .tables = row.tables},
                                               kLimits);
  EXPECT_EQ(step.action, row.action);
  if (row.action != Action::kDelete) return;
  EXPECT_EQ(step.table, row.table);
  EXPECT_EQ(step.through_id, row.through_id);
}

INSTANTIATE_TEST_SUITE_P(
    States, NextRetentionStep,
    testing::Values(
        Row{"EmptyStore", {}, 50'000, 0, Action::kNothing},
        Row{"EmptyStoreOverItsSize", {}, 200'000'000, 0, Action::kNothing},
        Row{"UnderTheSize", {kEvents, kMetrics}, 91'999'999, 0, Action::kNothing},
        Row{"AtTheSize", {kEvents, kMetrics}, 92'000'000, 0, Action::kNothing},
        // 65536 bytes at 460 bytes a row, from the table whose first row is oldest
        Row{"OverTheSize", {kEvents, kMetrics}, 92'000'001, 0, Action::kDelete, StoreTable::kMetrics, 142},
        Row{"FarOverTheSizeIsASlice", {kEvents}, 192'000'000, 0, Action::kDelete, StoreTable::kEvents, 260},
        Row{"LargeRowsGoOneByOne",
            {{.table = StoreTable::kEvents, .first_id = 5, .last_id = 104, .first_recorded_at = kNow}},
            92'000'001,
            0,
            Action::kDelete,
            StoreTable::kEvents,
            5},
        Row{"AtTheAge", {recordedAt(kEvents, kOldestKept)}, 1000, 0, Action::kNothing},
        Row{"OverTheAge",
            {kMetrics, recordedAt(kEvents, kOldestKept - 0.001)},
            1000,
            0,
            Action::kDelete,
            StoreTable::kEvents,
            260},
        Row{"RowsFromTheFutureStay", {recordedAt(kEvents, kNow + 5000)}, 1000, 0, Action::kNothing},
        Row{"AgeGoesBeforeSpace",
            {recordedAt(kEvents, 0)},
            1000,
            90'000'000,
            Action::kDelete,
            StoreTable::kEvents,
            260},
        Row{"LittleSpaceIsKeptForNewRows", {kEvents}, 1000, 4'000'000, Action::kNothing},
        Row{"AnEighthIsKeptForNewRows", {kEvents}, 70'000'000, 10'000'000, Action::kNothing},
        Row{"MoreIsHandedBack", {kEvents}, 70'000'000, 10'000'010, Action::kShrink},
        Row{"AnEmptyStoreHandsItsSpaceBack", {}, 1000, 10'000'000, Action::kShrink}),
    [](const auto& row) { return row.param.name; });

TEST(RetentionTest, AgeNeverTakesYoungerRowsAndSizeTakesWhatIsThere) {
  const TableSpan old = recordedAt(kEvents, 0);
  const auto by_age = nextRetentionStep({.now = kNow, .used_bytes = 1, .tables = {&old, 1}}, kLimits);
  EXPECT_EQ(by_age.recorded_before, kOldestKept);
  const auto by_size =
      nextRetentionStep({.now = kNow, .used_bytes = 200'000'000, .tables = {&kEvents, 1}}, kLimits);
  EXPECT_EQ(by_size.recorded_before, std::nullopt);
}

}  // namespace
}  // namespace tal
