// Identifiers and texts of any content: what is read stays within the text, and what has an inverse
// comes back.
#include <string>
#include <vector>

#include "fuzz/fuzz.h"
#include "platform/text.h"
#include "records/identifiers.h"
#include "records/node.h"
#include "records/records.h"

namespace {

using namespace KelvoUHW;
using fuzz::Require;

// In memory of exactly its size, with the zero that ends it.
std::vector<char16_t> Exact(const std::u16string& text) {
  return {text.c_str(), text.c_str() + text.size() + 1};
}

void CheckTexts(const std::u16string& text, std::string_view bytes) {
  const std::string utf8 = platform::ToUtf8(text);
  Require(platform::ToUtf8(platform::FromUtf8(utf8)) == utf8, "well-formed UTF-8 comes back");
  Require(platform::ToUtf8(platform::FromUtf8(bytes)) ==
              platform::ToUtf8(platform::FromUtf8(platform::ToUtf8(platform::FromUtf8(bytes)))),
          "mended once");
  const std::u16string lower = platform::ToLower(text);
  Require(lower.size() == text.size() && platform::ToLower(lower) == lower, "lowered once");
  Require(platform::EqualIgnoringCase(text, lower), "equal but for case");
  if (const auto guid = platform::ParseGuid(text)) {
    Require(platform::EqualIgnoringCase(platform::GuidText(*guid), text), "a GUID comes back");
    Require(ParseGuidText(Exact(text).data()) == *guid, "read alike");
  }
}

void CheckIdentifiers(const std::u16string& text) {
  const std::vector<char16_t> exact = Exact(text);
  const std::u16string whole(platform::UpToZero(text));
  ParseGuidText(exact.data());
  ParsePciHardwareId(exact.data());
  ParseHexField(exact.data(), text.size());
  Require(InterfacePathToInstanceId(exact.data()).size() <= whole.size(), "cut, not grown");
  if (const auto disk = DiskIdOfVolumeId(text)) {
    Require(disk->size() + 6 <= text.size() && disk->find(u'#') == disk->npos, "between marks");
  }
  CZKUMHubDeviceImpl hub;
  hub.SetInstanceId(text);
  Require(hub.m_strDevInstId == text, "kept whole");
  Require(text.ends_with(hub.m_strSerialNumber), "the last part");
  Require(text.find(hub.m_strVendor) != text.npos && text.find(hub.m_strProduct) != text.npos,
          "parts of the id");
  hub.SetHubName(whole);
  std::u16string dump;
  hub.ToString(dump, u"");
  Require(dump.ends_with(u"ChildsToString End\r\n"), "whole dump");
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string_view bytes(reinterpret_cast<const char*>(data), size);
  // Once as code units of any value, once as text.
  std::u16string units(size / 2, u'\0');
  for (std::size_t i = 0; i < units.size(); ++i) {
    units[i] = static_cast<char16_t>(data[2 * i] | data[2 * i + 1] << 8);
  }
  for (const std::u16string& text : {units, platform::FromUtf8(bytes)}) {
    CheckTexts(text, bytes);
    CheckIdentifiers(text);
  }
  return 0;
}
