#include "devinfo/property_reader.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstring>
#include <map>
#include <sstream>
#include <variant>

#include "platform/text.h"
#include "platform/wrappers/intercepting_host.h"
#include "simulation/pc/simulated_pc.h"

namespace KelvoUHW {
namespace {

using namespace platform;  // NOLINT: the test is about its constants

struct Value {
  std::u16string text{};
  std::uint32_t type = kREG_SZ;
  bool withoutZero = false;
  std::optional<std::uint32_t> claimedBytes{};  // told in place of the size
  std::optional<std::uint32_t> claimedAfter{};  // the same on success
  int outgrown = 0;                             // so many offers of the right size are refused
  std::optional<std::uint32_t> failure{};
  std::uint32_t Size() const { return static_cast<std::uint32_t>((text.size() + (withoutZero ? 0 : 1)) * 2); }
};

// Nothing of it reaches a PC.
struct ScriptedSets final : wrappers::InterceptingHost {
  ScriptedSets() : InterceptingHost(pc) {}
  simulated::SimulatedPc pc{{}};
  std::map<std::uint32_t, Value> values;
  Value id;
  std::vector<std::uint32_t> offered;
  Status GetDeviceRegistryProperty(DeviceSetHandle, const SP_DEVINFO_DATA&, std::uint32_t property, std::uint32_t* type,
                                   void* buffer, std::uint32_t bytes, std::uint32_t* required) noexcept override {
    offered.push_back(bytes);
    if (buffer == nullptr) return Status::Failure(kERROR_INVALID_PARAMETER);
    if (!values.contains(property)) return Status::Failure(kERROR_INVALID_DATA);
    Value& value = values[property];
    if (value.failure) return Status::Failure(*value.failure);
    *type = value.type;
    *required = value.claimedBytes.value_or(value.Size());
    if (bytes < value.Size() || value.outgrown-- > 0) return Status::Failure(kERROR_INSUFFICIENT_BUFFER);
    std::memcpy(buffer, value.text.c_str(), value.Size());
    *required = value.claimedAfter.value_or(*required);
    return Status::Success();
  }
  Status GetDeviceInstanceId(DeviceSetHandle, const SP_DEVINFO_DATA&, char16_t* buffer, std::uint32_t chars,
                             std::uint32_t* required) noexcept override {
    if (required) *required = id.claimedBytes.value_or(id.Size() / 2);
    if (!buffer || chars < id.Size() / 2 || id.failure) return Status::Failure(id.failure.value_or(122));
    std::memcpy(buffer, id.text.c_str(), id.Size());
    return Status::Success();
  }
  Status BeforeCall(const wrappers::HostCall&) noexcept override { return Status::Failure(50); }
};

TEST(DeviceProperty, IsReadWithinWhatWasReceived) {
  constexpr std::uint32_t kFirst = PropertyBuffer::kFirstBytes;
  const std::vector<std::uint32_t> withoutEnd(kMostPropertyReads, kFirst);
  const std::u16string fits(kFirst / 2 - 1, u'f'), tooLong(kFirst / 2, u't');
  // One buffer serves all but the longest: what a longer text left in it must not show.
  const std::tuple<Value, std::u16string, std::vector<std::uint32_t>> cases[] = {
      {{.text = fits}, fits, {kFirst}},
      {{.text = u"abc", .claimedAfter = 0xFFFFFFFF}, u"abc", {kFirst}},
      {{.text = u"abc"}, u"abc", {kFirst}},
      {{.text = u"abc", .withoutZero = true}, u"abc", {kFirst}},
      {{.text = u"abc", .claimedAfter = 5}, u"ab", {kFirst}},
      {{.text = u"", .withoutZero = true}, u"", {kFirst}},
      {{.text = std::u16string(u"a\0b", 3)}, u"a", {kFirst}},
      {{.text = u"a", .claimedBytes = 9}, u"a", {kFirst}},
      {{.text = u"abc", .outgrown = 2}, u"abc", {kFirst, kFirst, kFirst}},
      {{.text = u"abc", .outgrown = 99}, u"failure 122", withoutEnd},
      {{.text = u"abc", .claimedBytes = 0xFFFFFFFF, .outgrown = 1}, u"failure 122", {kFirst}},
      {{.failure = kERROR_INVALID_DATA}, u"failure 13", {kFirst}},
      {{.failure = 0}, u"failure 0", {kFirst}},
      {{.text = tooLong}, tooLong, {kFirst, kFirst + 2}},
      {{.text = u"a", .claimedBytes = kMostPropertyBytes + 1, .outgrown = 1}, u"failure 122", {kFirst + 2}},
      {{.text = u"a", .claimedBytes = kMostPropertyBytes, .outgrown = 1}, u"a", {kFirst + 2, kMostPropertyBytes}}};
  PropertyBuffer buffer;
  for (const auto& [value, read, offered] : cases) {
    ScriptedSets sets;
    sets.values[kSPDRP_MFG] = value;
    std::uint32_t type = 0;
    const Status status = ReadDeviceProperty(sets, 1, {}, kSPDRP_MFG, type, buffer);
    const PropertyAnswer answer{true, type, buffer.Received(), buffer.Chars()};
    EXPECT_EQ(status ? std::u16string(TextOf(answer)) : u"failure " + Decimal(static_cast<int>(status.error)), read);
    EXPECT_EQ(sets.offered, offered);
  }
  const std::pair<Value, std::u16string> ids[] = {
      {{.text = u"USB/A\\B/"}, u"USB\\A\\B\\"},
      {{.text = u"AB", .withoutZero = true}, u"AB"},
      {{.text = u"AB", .failure = 0}, u""},
      {{.text = u"ABCDEF", .claimedBytes = 3}, u"ABC"},
      {{.text = std::u16string(300, u'L')}, std::u16string(300, u'L')},
      {{.text = std::u16string(300, u'L'), .claimedBytes = 0xFFFFFFFF}, u""},
      {{.text = std::u16string(300, u'L'), .claimedBytes = 65537}, u""},
      {{.text = std::u16string(300, u'L'), .claimedBytes = 65536}, std::u16string(300, u'L')},
      // There is room for one character more than was told.
      {{.text = std::u16string(302, u'L'), .withoutZero = true, .claimedBytes = 301}, std::u16string(302, u'L')},
      {{.text = u"AB", .claimedBytes = 0}, u""}};
  for (const auto& [value, id] : ids) {
    ScriptedSets sets;
    sets.id = value;
    EXPECT_EQ(GetInstanceId(sets, 1, {}), id);
  }
}

// What is kept answers like what was read: to a reader with a buffer of eight bytes, too, of which the last character
// has to be a zero. Of an odd number of bytes the last one counts as a character.
TEST(DeviceProperty, IsKeptAsItWasRead) {
  const std::tuple<Value, std::optional<std::u16string>, std::u16string> cases[] = {
      {{.text = u"abc"}, u"abc", u"abc"},
      {{.text = u"abc", .withoutZero = true}, u"abc", u"abc"},
      {{.text = u"ab\u4363", .claimedAfter = 5}, u"abc", u"ab"},
      {{.text = std::u16string(u"a\0b", 3)}, u"a", u"a"},
      {{.text = u"abcd", .withoutZero = true}, std::nullopt, u"abcd"},
      {{.text = u"abcd"}, std::nullopt, u"abcd"},
      {{.failure = kERROR_INVALID_DATA}, std::nullopt, u""}};
  for (const auto& [value, within, whole] : cases) {
    ScriptedSets sets;
    sets.values[kSPDRP_MFG] = value;
    DeviceAnswers answers(sets);
    ElementReader reader(sets, 1, answers);
    PropertyAnswer answer;
    const bool has = reader.ReadAndKeep({}, kSPDRP_MFG, answer);
    EXPECT_EQ(has, !value.failure);
    reader.ReadAndKeep({}, kSPDRP_CLASS, answer);  // kept as not there
    for (const bool kept : {false, true}) {
      EXPECT_EQ(reader.Read({}, kSPDRP_MFG, answer), has);
      EXPECT_EQ(TextOf(answer), whole) << kept;
      const auto text = has ? TextWithin(answer, 8) : std::nullopt;
      EXPECT_EQ(text ? std::optional(std::u16string(*text)) : std::nullopt, within) << kept;
      EXPECT_FALSE(reader.Read({}, kSPDRP_CLASS, answer));
      EXPECT_EQ(sets.offered.size(), 2u);
    }
  }
}

// An id that leaves no zero at the end of the buffer is asked for each time, and so is one for a smaller buffer.
TEST(DeviceAnswers, IdsAreKeptWhereTheyFit) {
  struct Ids final : wrappers::InterceptingHost {
    using InterceptingHost::InterceptingHost;
    Status BeforeCall(const wrappers::HostCall&) noexcept override { return {}; }
    Status GetDeviceId(DevInst, char16_t* buffer, std::uint32_t chars) noexcept override {
      ++calls;
      std::fill_n(buffer, chars, u'\0');
      std::fill_n(buffer, std::min(length, chars), u'i');
      return Status::Success();
    }
    std::uint32_t length = 0;
    int calls = 0;
  };
  simulated::SimulatedPc pc{{}};
  for (const auto& [length, chars, calls] : {std::tuple{7u, 8u, 1}, {8, 8, 2}, {7, 7, 2}}) {
    Ids ids(pc);
    ids.length = length;
    DeviceAnswers answers(ids);
    for (const std::uint32_t offered : {8u, chars}) {
      std::array<char16_t, 9> buffer;
      buffer.fill(u'|');
      EXPECT_TRUE(answers.GetDeviceId(5, buffer.data(), offered));
      EXPECT_EQ(std::u16string_view(buffer.data(), buffer.size()).find(u'|'), offered) << length;
    }
    EXPECT_EQ(ids.calls, calls) << length << " " << chars;
  }
}

bool Read(ScriptedSets& sets, CZKUMInfoDeviceImpl& record) {
  DeviceAnswers answers(sets);
  ElementReader reader(sets, 1, answers);
  PassedElements none;
  const bool class_accepted = ReadClass(reader, {}, record);
  const bool service_accepted = ReadService(reader, {}, record);  // read in either case
  ReadOtherProperties(reader, {}, none, record);
  return class_accepted && service_accepted;
}

TEST(InfoDeviceProperties, FillTheirFields) {
  ScriptedSets sets;
  CZKUMInfoDeviceImpl record;
  const std::pair<std::uint32_t, std::variant<std::u16string*, SharedText*>> fields[] = {
      {kSPDRP_SERVICE, &record.Service},
      {kSPDRP_CLASS, &record.DevClass},
      {kSPDRP_DEVICEDESC, &record.m_strDeviceDescr},
      {kSPDRP_CLASSGUID, &record.ClassGuidText},
      {kSPDRP_DRIVER, &record.m_strDriverKeyName},
      {kSPDRP_FRIENDLYNAME, &record.FriendlyName},
      {kSPDRP_LOCATION_INFORMATION, &record.Location},
      {kSPDRP_MFG, &record.Manufacturer},
      {kSPDRP_HARDWAREID, &record.HardwareId},
      {kSPDRP_PHYSICAL_DEVICE_OBJECT_NAME, &record.PhysicalName},
      {kSPDRP_ENUMERATOR_NAME, &record.EnumName}};
  for (const auto& [property, field] : fields) {
    sets.values[property].text = u"{0000000A " + std::u16string(property, u'x');
  }
  // Deliberate: the registry data types are stored, not the values.
  sets.values[kSPDRP_LEGACYBUSTYPE] = {.text = u"\x05", .type = kREG_DWORD};
  sets.values[kSPDRP_UI_NUMBER] = {.text = u"\x09", .type = kREG_MULTI_SZ};
  ASSERT_TRUE(Read(sets, record));
  const auto textOf = [](const auto& field) {
    return std::visit([](const auto* text) { return std::u16string_view(*text); }, field);
  };
  for (const auto& [property, field] : fields) EXPECT_EQ(textOf(field), sets.values[property].text) << property;
  // What cannot be read stays, except service and class; what is empty becomes empty.
  sets.values = {{kSPDRP_MFG, {}}, {kSPDRP_DRIVER, {.failure = 0}}};
  ASSERT_TRUE(Read(sets, record));
  for (const auto& [property, field] : fields) {
    const bool emptied = property == kSPDRP_SERVICE || property == kSPDRP_CLASS || property == kSPDRP_MFG;
    EXPECT_EQ(textOf(field).empty(), emptied) << property;
  }
  EXPECT_EQ(record.ClassGuid, (Guid{0xA, 0, 0, {}}));
  EXPECT_EQ(record.LegacyBusType, 4);
  EXPECT_EQ(record.UiNumber, 7);
}

TEST(InfoDeviceProperties, ServicesExcludeIgnoringCaseAndClassesExactly) {
  const auto accepts = [](const std::u16string& service, const std::u16string& deviceClass) {
    ScriptedSets sets;
    sets.values = {{kSPDRP_SERVICE, {service}}, {kSPDRP_CLASS, {deviceClass}}};
    CZKUMInfoDeviceImpl record;
    const bool accepted = Read(sets, record);
    EXPECT_EQ(std::u16string(record.Service) + std::u16string(record.DevClass), service + deviceClass);
    return accepted;
  };
  std::istringstream services(
      "usbhub usbuhci usbehci fdc flpydisk cdrom imagedrv pciide atapi http ipnat ipsec kbdhid ohci1394 mouhid arp1394 "
      "beep dmboot dmload gpc ndproxy audstub sthda sysaudio kmixer splitter aec swmidi ialm wdmaud null");
  for (std::string name; services >> name;) {
    const std::u16string service = FromUtf8(name);
    EXPECT_FALSE(accepts(service, u"USB") || accepts(ToUpper(service), u"")) << name;
    EXPECT_TRUE(accepts(service + u"3", u"USB")) << name;
  }
  for (const char16_t* name : {u"Monitor", u"System", u"Ports", u"Net", u"Computer", u"LegacyDriver", u"Processor"}) {
    EXPECT_FALSE(accepts(u"", name) || accepts(u"disk", name)) << ToUtf8(name);
    EXPECT_TRUE(accepts(u"disk", ToLower(name)) && accepts(u"disk", ToUpper(name))) << ToUtf8(name);
  }
  for (const char16_t* service : {u"", u"usb", u"disk"}) EXPECT_TRUE(accepts(service, u"DiskDrive"));
}

}  // namespace
}  // namespace KelvoUHW
