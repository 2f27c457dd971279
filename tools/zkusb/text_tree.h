// A tree of lines, drawn with box characters.
#pragma once

#include <string>
#include <vector>

#include "tools/zkusb/writer.h"

namespace zkusb {

// One line and those below it. Where the line is too long, the middle is shortened first.
struct TextTree {
  std::u16string head;
  std::u16string middle;
  std::u16string tail;
  std::vector<TextTree> below;
};

void PrintTextTree(const TextTree& root, Writer& out);

}  // namespace zkusb
