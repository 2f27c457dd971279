// A JSON document that is written while it is made: that of a PC with thousands of devices is never
// held as a whole.
#pragma once

#include <string>
#include <vector>

#include "tools/zkusb/json.h"
#include "tools/zkusb/writer.h"

namespace zkusb {

// What every document begins with: the version of its shape, that of the program, and the command.
Json DocumentHead(const char* command);

// One object, indented, which is open from the beginning and closed by Finish. Whoever is thrown
// out before leaves an unfinished text behind, which no reader takes for a document.
class JsonDocument {
 public:
  // `out` outlives the document.
  JsonDocument(const char* command, Writer& out);

  void Members(const Json& object);  // each of them, into the open object
  void BeginArray(const char* name);
  void BeginObject(const char* name);
  void BeginElement();              // an object, in the open array
  void Element(const Json& value);  // in the open array
  // A text of any length, as a member.
  void Text(const char* name, std::u16string_view text);
  void End();  // of what was begun last
  void Finish();

 private:
  void Next();
  void Begin(const char* name, char16_t open, char16_t close);
  void Value(const Json& value);

  Writer& m_out;
  std::u16string m_indent;
  std::u16string m_open;  // the closing brackets to come
  bool m_first = true;    // in what was begun last
};

// A tree with everything below it, in "Childs", into an object that is open.
void WriteTree(const NodeView& root, JsonDocument& document);

}  // namespace zkusb
