// The only way out for texts: everything that the program prints goes through a Writer.
#pragma once

#include <cstddef>
#include <nlohmann/json.hpp>
#include <ostream>
#include <string>
#include <string_view>

namespace zkusb {

// Columns of a fitted line; one code point is one column.
inline constexpr std::size_t kColumns = 80;

// Turns text into UTF-8. A device chooses its own texts, so control characters and those that turn
// the direction of writing are written as \xNN or \uNNNN and cannot reach the terminal. The stream
// is the caller's; failures show in its state.
class Writer {
 public:
  explicit Writer(std::ostream& stream) noexcept : m_stream(stream) {}

  // One line, however long.
  void Line(std::u16string_view text);
  // One line of at most kColumns. What is too long loses the end of its middle, where an ellipsis
  // shows it; where head and tail fill the line by themselves, its end goes.
  void FittedLine(std::u16string_view head, std::u16string_view middle, std::u16string_view tail);
  // Text of several lines of our own, ended with a line end.
  void Paragraph(std::u16string_view text);
  // A value and a line end; on one line unless `indented`.
  void Json(const nlohmann::ordered_json& value, bool indented);
  // The text as it is, control characters and all.
  void Verbatim(std::u16string_view text);

 private:
  std::ostream& m_stream;
};

// For people: without blanks at the ends, and with one blank where the device padded with several.
std::u16string Tidied(std::u16string_view text);

}  // namespace zkusb
