#pragma once

// Text fitted to the columns of a terminal. What came from a client cannot move
// the cursor or change colours: it is escaped before it is laid out.

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace tal::talctl {

/// Columns that there are; nothing: as many as the text takes.
using Width = std::optional<std::size_t>;

/// Control characters, marks that reverse the direction of writing, and bytes
/// that are not UTF-8 as \u00NN (which JSON reads back); all else as it is.
std::string escapeControls(std::string_view text);

/// Columns that the text takes: two for East Asian wide characters and emoji,
/// none for combining marks. `text` has been escaped.
std::size_t displayWidth(std::string_view text);

/// The text, or as much of its beginning as fits with "…" behind it.
std::string cutToWidth(std::string_view text, std::size_t width);

/// Lines of whole words, one blank between two, each at most `width` columns. A
/// word that is wider than a line is broken.
std::vector<std::string> wrapWords(const std::vector<std::string>& words, Width width);

/// Rows under a heading, columns two blanks apart. Where they do not fit, the
/// widest columns give way, and what stands in them is cut.
class Table {
 public:
  explicit Table(std::vector<std::string> heading);

  /// Numbers stand below one another with their ends, and are cut last of all; columns count from 0.
  void alignRight(std::size_t column);

  /// One cell for each column of the heading. Cells are escaped here.
  void addRow(const std::vector<std::string>& cells);

  /// Every line ends with "\n" and holds no blanks before that.
  std::string text(Width width) const;

 private:
  std::vector<std::size_t> columnWidths(Width width) const;
  std::size_t columnToNarrow(const std::vector<std::size_t>& widths) const;

  std::vector<std::vector<std::string>> rows_;
  std::vector<bool> right_;
};

}  // namespace tal::talctl
