#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "platform/TemporaryDirectory.h"
#include "platform/linux/process/InstanceLock.h"
#include "platform/linux/process/StartupError.h"

namespace tal {
namespace {

using testing::HasSubstr;
using testing::ThrowsMessage;

TEST(InstanceLockTest, RefusesTheSecondUntilTheFirstHasGone) {
  const test::TemporaryDirectory directory;
  {
    const InstanceLock first(directory.path());
    EXPECT_THAT([&] { InstanceLock second(directory.path()); },
                ThrowsMessage<StartupError>(
                    HasSubstr("another talreportingd is running on " + directory.path().string())));
  }
  EXPECT_NO_THROW(InstanceLock third(directory.path()));
}

TEST(InstanceLockTest, SaysWhyItCannotBeTaken) {
  const test::TemporaryDirectory directory;
  EXPECT_THAT([&] { InstanceLock lock(directory.path() / "missing"); },
              ThrowsMessage<StartupError>(HasSubstr("No such file or directory")));
}

}  // namespace
}  // namespace tal
