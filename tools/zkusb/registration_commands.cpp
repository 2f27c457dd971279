// The commands register and unregister.
#include <algorithm>

#include "tools/zkusb/commands.h"
#include "tools/zkusb/json_document.h"

namespace zkusb {

namespace {

void PrintLines(const std::vector<std::u16string>& lines, std::u16string_view before, Writer& out) {
  for (const std::u16string& line : lines) out.Line(std::u16string(before).append(line));
}

}  // namespace

void PrintRegistration(Pc& pc, bool json, Writer& out) {
  pc.Register();
  const std::vector<std::u16string> written = pc.RegistryLines();
  if (json) {
    JsonDocument document("register", out);
    document.Members({{"written", TextsJson(written)}});
    document.Finish();
  } else {
    PrintLines(written, {}, out);
  }
}

void PrintUnregistration(Pc& pc, bool json, Writer& out) {
  const std::vector<std::u16string> before = pc.RegistryLines();
  pc.Unregister();
  const std::vector<std::u16string> left = pc.RegistryLines();
  std::vector<std::u16string> removed;
  std::copy_if(before.begin(), before.end(), std::back_inserter(removed),
               [&](const std::u16string& line) {
                 return std::find(left.begin(), left.end(), line) == left.end();
               });
  if (json) {
    JsonDocument document("unregister", out);
    document.Members({{"removed", TextsJson(removed)}, {"left", TextsJson(left)}});
    document.Finish();
    return;
  }
  PrintLines(removed, u"removed  ", out);
  PrintLines(left, u"left     ", out);
}

}  // namespace zkusb
