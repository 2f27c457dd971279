#include "tools/zkusb/text_tree.h"

namespace zkusb {

namespace {

void PrintBelow(const TextTree& tree, const std::u16string& indent, Writer& out) {
  for (const TextTree& line : tree.below) {
    const bool last = &line == &tree.below.back();
    out.FittedLine(indent + (last ? u"└─ " : u"├─ ") + line.head, line.middle, line.tail);
    PrintBelow(line, indent + (last ? u"   " : u"│  "), out);
  }
}

}  // namespace

void PrintTextTree(const TextTree& root, Writer& out) {
  out.FittedLine(root.head, root.middle, root.tail);
  PrintBelow(root, u"", out);
}

}  // namespace zkusb
