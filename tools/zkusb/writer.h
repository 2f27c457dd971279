// The only way out for texts: everything that the program prints goes through a Writer.
#pragma once

#include <cstddef>
#include <nlohmann/json.hpp>
#include <ostream>
#include <string>
#include <string_view>

namespace zkusb {

// Turns text into UTF-8. A device chooses its own texts, so control characters and those that turn
// the direction of writing are written as \xNN or \uNNNN and cannot reach the terminal. The stream
// is the caller's; failures show in its state.
class Writer {
 public:
  explicit Writer(std::ostream& stream) noexcept : m_stream(stream) {}

  // How wide a fitted line may be; 0 is without limit, as at first. One code point is one column.
  void SetColumns(std::size_t columns) noexcept { m_columns = columns; }
  // From now on a line goes out as soon as it is written, for a reader that looks on.
  void FlushEachLine() noexcept { m_flushEachLine = true; }
  // From now on JSON holds no character that begins or ends an element of HTML.
  void BeInMarkup() noexcept { m_inMarkup = true; }
  // False when something could not be written.
  bool Good() const { return m_stream.good(); }

  // One line, however long.
  void Line(std::u16string_view text);
  // One line within the columns. What is too long loses the end of its middle, where an ellipsis
  // shows it; where head and tail fill the line by themselves, its end goes.
  void FittedLine(std::u16string_view head, std::u16string_view middle, std::u16string_view tail);
  // Text of several lines of our own, ended with a line end.
  void Paragraph(std::u16string_view text);
  // A value on one line, and the line end.
  void JsonLine(const nlohmann::ordered_json& value);
  // JSON text, or a part of it that ends between two characters.
  void Json(std::u16string_view text);
  // The text as it is, control characters and all.
  void Verbatim(std::u16string_view text);

 private:
  void EndLine();

  std::ostream& m_stream;
  std::size_t m_columns = 0;
  bool m_flushEachLine = false;
  bool m_inMarkup = false;
};

// For people: without blanks at the ends, and with one blank where the device padded with several.
std::u16string Tidied(std::u16string_view text);

}  // namespace zkusb
