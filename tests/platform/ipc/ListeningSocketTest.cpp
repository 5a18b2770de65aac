#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <filesystem>
#include <string>

#include "platform/TemporaryDirectory.h"
#include "platform/ipc/WireClient.h"
#include "platform/linux/ipc/ListeningSocket.h"
#include "platform/linux/process/StartupError.h"

namespace tal {
namespace {

using test::TemporaryDirectory;
using test::WireClient;
using testing::HasSubstr;

std::string refusal(const std::filesystem::path& path) {
  try {
    const ListeningSocket socket(path);
  } catch (const StartupError& error) {
    return error.what();
  }
  return "";
}

TEST(ListeningSocket, IsOpenToAllAndGoneAfterwards) {
  const TemporaryDirectory directory;
  const auto path = directory.path() / "socket";
  {
    const ListeningSocket socket(path);
    struct stat status {};
    ASSERT_EQ(::stat(path.c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777U, 0666U);
    EXPECT_NO_THROW(WireClient{path});
  }
  EXPECT_FALSE(std::filesystem::exists(path));
}

TEST(ListeningSocket, ReplacesOnlyWhatADeadDaemonLeft) {
  const TemporaryDirectory directory;
  const auto path = directory.path() / "socket";
  {
    ListeningSocket dead(path);
    ::close(dead.releaseSocket());
    const auto kept = directory.path() / "kept";
    std::filesystem::rename(path, kept);
    dead.removeFile();
    std::filesystem::rename(kept, path);
  }
  const ListeningSocket living(path);
  EXPECT_NO_THROW(WireClient{path});
  EXPECT_THAT(refusal(path), HasSubstr("another daemon"));
  EXPECT_NO_THROW(WireClient{path}) << "the living one was not harmed";

  test::writeFile(directory.path() / "file", "precious");
  EXPECT_THAT(refusal(directory.path() / "file"), HasSubstr("another kind"));
  EXPECT_EQ(test::readFile(directory.path() / "file"), "precious");
  EXPECT_THAT(refusal(directory.path() / "missing" / "socket"), HasSubstr("cannot be bound"));
  EXPECT_THAT(refusal(directory.path() / std::string(200, 'x')), HasSubstr("too long"));
}

TEST(ListeningSocket, LeavesASuccessorsFileAlone) {
  const TemporaryDirectory directory;
  const auto path = directory.path() / "socket";
  auto first = std::make_unique<ListeningSocket>(path);
  std::filesystem::remove(path);
  const ListeningSocket second(path);
  first.reset();
  EXPECT_NO_THROW(WireClient{path});
}

}  // namespace
}  // namespace tal
