#include <gtest/gtest.h>

#include <string>
#include <utility>
#include <vector>

#include "core/SafeFileName.h"

namespace tal {
namespace {

TEST(SafeInFileName, KeepsWhatIsHarmless) {
  const std::string eighty(80, 'x');
  const std::vector<std::pair<std::string, std::string>> rows{
      {"my.app", "my.app"},
      {"../../etc/passwd", "___.._etc_passwd"},
      {"...", "___"},
      {"a\nb\x7F", "a_b_"},
      {"\xC2\x9Bm\xC2\xA0", "_m\xC2\xA0"},
      {std::string("a\0b", 3), "a_b"},
      {"", ""},
      {eighty + "y", eighty},
      {std::string(79, 'x') + "\xC3\xA9", std::string(79, 'x')}};
  for (const auto& [text, name] : rows) EXPECT_EQ(safeInFileName(text), name);
}

}  // namespace
}  // namespace tal
