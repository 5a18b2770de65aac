#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <array>
#include <sstream>
#include <string>
#include <thread>

#include "platform/TemporaryDirectory.h"
#include "platform/linux/logging/LogLine.h"
#include "platform/linux/logging/StderrLogSink.h"

namespace tal {
namespace {

using testing::MatchesRegex;

class StderrLogSinkTest : public testing::Test {
 protected:
  StderrLogSinkTest() : file_(::open(path_.c_str(), O_RDWR | O_CREAT | O_APPEND | O_CLOEXEC, 0600)) {}
  ~StderrLogSinkTest() override { ::close(file_); }

  test::TemporaryDirectory directory_;
  std::filesystem::path path_ = directory_.path() / "log";
  int file_;
};

TEST_F(StderrLogSinkTest, LineHasTimeChannelLevelPrefixAndText) {
  StderrLogSink sink(file_);
  const LogChannels log(&sink);
  TAL_LOG(log.service, "newConnection: ", 7);
  TAL_LOG_ERROR(log.summary, "no room");
  constexpr const char* kTime = "[0-9]{4}-[0-9]{2}-[0-9]{2}T[0-9]{2}:[0-9]{2}:[0-9]{2}\\.[0-9]{6}Z";
  EXPECT_THAT(test::readFile(path_),
              MatchesRegex(std::string(kTime) +
                           " talrs default         StderrLogSinkTest:[0-9]+ +newConnection: 7\n" + kTime +
                           " talru error           StderrLogSinkTest:[0-9]+ +no room\n"));
}

TEST_F(StderrLogSinkTest, LinesOfManyThreadsDoNotMix) {
  constexpr int kThreads = 4;
  constexpr int kLinesEach = 50;
  // Longer than what a pipe takes as one piece.
  constexpr std::size_t kLong = 10000;
  std::array<int, 2> pipe{};
  ASSERT_EQ(::pipe2(pipe.data(), O_CLOEXEC), 0);
  StderrLogSink sink(pipe[1]);
  std::string received;
  std::jthread reader([&] {
    std::array<char, 4096> piece{};
    for (ssize_t size = 0; (size = ::read(pipe[0], piece.data(), piece.size())) > 0;) {
      received.append(piece.data(), static_cast<std::size_t>(size));
    }
  });
  {
    std::array<std::jthread, kThreads> writers;
    for (int i = 0; i < kThreads; ++i) {
      writers[static_cast<std::size_t>(i)] = std::jthread([&sink, i] {
        const std::string text(kLong, static_cast<char>('a' + i));
        for (int line = 0; line < kLinesEach; ++line) sink.write("talrs", LogLevel::kDefault, text);
      });
    }
  }
  ::close(pipe[1]);
  reader.join();
  ::close(pipe[0]);

  std::istringstream lines(received);
  int count = 0;
  for (std::string line; std::getline(lines, line); ++count) {
    ASSERT_GT(line.size(), kLong);
    const std::string text = line.substr(line.size() - kLong);
    ASSERT_EQ(text, std::string(kLong, text.front()));
  }
  EXPECT_EQ(count, kThreads * kLinesEach);
}

TEST_F(StderrLogSinkTest, SurvivesADescriptorThatNobodyReads) {
  std::array<int, 2> pipe{};
  ASSERT_EQ(::pipe2(pipe.data(), O_CLOEXEC), 0);
  ::close(pipe[0]);
  StderrLogSink(pipe[1]).write("talrs", LogLevel::kError, "into a broken pipe");
  ::close(pipe[1]);
  StderrLogSink(pipe[1]).write("talrs", LogLevel::kError, "into a closed descriptor");
}

struct EscapeCase {
  std::string_view name, text, expected;
};

class AppendEscaped : public testing::TestWithParam<EscapeCase> {};

TEST_P(AppendEscaped, LeavesNothingThatActsOnAReader) {
  std::string out = "before ";
  appendEscaped(out, GetParam().text);
  EXPECT_EQ(out, "before " + std::string(GetParam().expected));
}

INSTANTIATE_TEST_SUITE_P(Texts, AppendEscaped,
                         testing::Values(EscapeCase{"Empty", "", ""},
                                         EscapeCase{"Plain", "a \\ \" ~", "a \\ \" ~"},
                                         EscapeCase{"LineEnds", "a\nb\r\n", "a\\nb\\r\\n"},
                                         EscapeCase{"TerminalSequence", "\x1b[2J\t", "\\x1b[2J\\t"},
                                         EscapeCase{"Nul", std::string_view("a\0b", 3), "a\\x00b"},
                                         EscapeCase{"Delete", "\x7f", "\\x7f"},
                                         EscapeCase{"C1",
                                                    "\xc2\x9b"
                                                    "2J\xc2\x80\xc2\x9f",
                                                    "\\xc2\\x9b2J\\xc2\\x80\\xc2\\x9f"},
                                         EscapeCase{"Latin", "\xc2\xa0\xc3\xa9", "\xc2\xa0\xc3\xa9"},
                                         EscapeCase{"FourBytes", "\xf0\x9f\x8e\xb5!", "\xf0\x9f\x8e\xb5!"},
                                         EscapeCase{"BareContinuation",
                                                    "\x9b"
                                                    "2J",
                                                    "\\x9b2J"},
                                         EscapeCase{"CutShort", "\xf0\x9f\x8e", "\\xf0\\x9f\\x8e"},
                                         EscapeCase{"Overlong", "\xc0\x8a", "\\xc0\\x8a"},
                                         EscapeCase{"Surrogate", "\xed\xa0\x80", "\\xed\\xa0\\x80"}),
                         [](const auto& row) { return std::string(row.param.name); });

}  // namespace
}  // namespace tal
