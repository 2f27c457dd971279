#include "devinfo/property_reader.h"

#include <gtest/gtest.h>

#include <cstring>
#include <list>
#include <map>
#include <optional>

#include "platform/simulated/simulated_pc.h"
#include "platform/wrappers/intercepting_host.h"

namespace KelvoUHW {
namespace {

using namespace platform;  // NOLINT: the test is about its constants

struct Value {
  std::u16string_view text{};
  std::uint32_t type = kREG_SZ;
  bool withoutZero = false;
  std::optional<std::uint32_t> claimedBytes{};  // told in place of the size
  std::optional<std::uint32_t> claimedAfter{};  // the same on success
  int outgrown = 0;                             // so many offers of the right size are refused
  std::optional<std::uint32_t> failure{};
};

// Nothing of it reaches a PC.
class ScriptedSets final : public wrappers::InterceptingHost {
 public:
  ScriptedSets() : InterceptingHost(pc) {}
  simulated::SimulatedPc pc{{}};
  std::map<std::uint32_t, Value> values;
  Value id;
  std::vector<std::uint32_t> offered;

  Status GetDeviceRegistryProperty(DeviceSetHandle, const SP_DEVINFO_DATA&, std::uint32_t property,
                                   std::uint32_t* type, void* buffer, std::uint32_t bytes,
                                   std::uint32_t* required) noexcept override {
    offered.push_back(bytes);
    if (buffer == nullptr) return Status::Failure(kERROR_INVALID_PARAMETER);
    const auto found = values.find(property);
    if (found == values.end()) return Status::Failure(kERROR_INVALID_DATA);
    Value& value = found->second;
    if (value.failure) return Status::Failure(*value.failure);
    const std::uint32_t size = SizeOf(value);
    *type = value.type;
    *required = value.claimedBytes.value_or(size);
    if (bytes < size || value.outgrown-- > 0) return Status::Failure(kERROR_INSUFFICIENT_BUFFER);
    std::memcpy(buffer, std::u16string(value.text).c_str(), size);
    *required = value.claimedAfter.value_or(*required);
    return Status::Success();
  }
  Status GetDeviceInstanceId(DeviceSetHandle, const SP_DEVINFO_DATA&, char16_t* buffer,
                             std::uint32_t chars, std::uint32_t* required) noexcept override {
    const std::uint32_t size = SizeOf(id) / 2;
    if (required) *required = id.claimedBytes.value_or(size);
    if (!buffer || chars < size || id.failure) return Status::Failure(id.failure.value_or(122));
    std::memcpy(buffer, std::u16string(id.text).c_str(), size * 2);
    return Status::Success();
  }

 private:
  Status BeforeCall(const wrappers::HostCall&) noexcept override { return Status::Failure(50); }
  static std::uint32_t SizeOf(const Value& value) {
    return static_cast<std::uint32_t>((value.text.size() + (value.withoutZero ? 0 : 1)) * 2);
  }
};

TEST(DeviceProperty, IsReadWithinWhatWasReceived) {
  struct Case {
    Value value;
    std::u16string_view text;
    std::vector<std::uint32_t> offered;
    std::optional<std::uint32_t> failure{};
  };
  std::vector<std::uint32_t> withoutEnd(kMostPropertyReads, 8);
  withoutEnd[0] = 0;
  // One buffer serves all: what a longer text left in it must not show.
  const Case cases[] = {{{.text = u"long enough"}, u"long enough", {0, 24}},
                        {{.text = u"abc", .withoutZero = true, .claimedAfter = 99}, u"abc", {0, 6}},
                        {{.text = u"abc"}, u"abc", {0, 8}},
                        {{.text = u"abc", .withoutZero = true}, u"abc", {0, 6}},
                        {{.text = u"abc", .claimedAfter = 5}, u"ab", {0, 8}},
                        {{.text = u"", .withoutZero = true}, u"", {0}},
                        {{.text = std::u16string_view(u"a\0b", 3)}, u"a", {0, 8}},
                        {{.text = u"a", .claimedBytes = 9}, u"a", {0, 9}},
                        {{.text = u"abc", .outgrown = 2}, u"abc", {0, 8, 8, 8}},
                        {{.text = u"abc", .outgrown = 99}, u"", withoutEnd, 122},
                        {{.text = u"abc", .claimedBytes = 0xFFFFFFFF}, u"", {0}, 122},
                        {{.failure = kERROR_INVALID_DATA}, u"", {0}, kERROR_INVALID_DATA},
                        {{.failure = 0}, u"", {0}, 0}};
  PropertyBuffer buffer;
  for (const Case& c : cases) {
    ScriptedSets sets;
    sets.values[kSPDRP_MFG] = c.value;
    std::uint32_t type = 0;
    const Status status = ReadDeviceProperty(sets, 1, {}, kSPDRP_MFG, type, buffer);
    EXPECT_EQ(status ? std::nullopt : std::optional(status.error), c.failure);
    if (status) {
      EXPECT_EQ(buffer.Text(), c.text);
      EXPECT_EQ(type, kREG_SZ);
    }
    EXPECT_EQ(sets.offered, c.offered);
  }
}

TEST(InstanceIdOfElement, IsReadInTwoSteps) {
  const std::pair<Value, std::u16string_view> cases[] = {
      {{.text = u"USB/A\\B/"}, u"USB\\A\\B\\"},
      {{.text = u"AB", .withoutZero = true}, u"AB"},
      {{.text = u"AB", .failure = 0}, u""},
      {{.text = u"ABCDEF", .claimedBytes = 3}, u""},
      {{.text = u"AB", .claimedBytes = 0xFFFFFFFF}, u""},
      {{.text = u"AB", .claimedBytes = 0}, u""}};
  for (const auto& [value, id] : cases) {
    ScriptedSets sets;
    sets.id = value;
    EXPECT_EQ(GetInstanceId(sets, 1, {}), id);
  }
}

// Each text property with its field.
const std::vector<std::pair<std::uint32_t, std::u16string CZKUMInfoDeviceImpl::*>> kTextFields = {
    {kSPDRP_SERVICE, &CZKUMInfoDeviceImpl::Service},
    {kSPDRP_CLASS, &CZKUMInfoDeviceImpl::DevClass},
    {kSPDRP_DEVICEDESC, &CZKUMInfoDeviceImpl::m_strDeviceDescr},
    {kSPDRP_CLASSGUID, &CZKUMInfoDeviceImpl::ClassGuidText},
    {kSPDRP_DRIVER, &CZKUMInfoDeviceImpl::m_strDriverKeyName},
    {kSPDRP_FRIENDLYNAME, &CZKUMInfoDeviceImpl::FriendlyName},
    {kSPDRP_LOCATION_INFORMATION, &CZKUMInfoDeviceImpl::Location},
    {kSPDRP_MFG, &CZKUMInfoDeviceImpl::Manufacturer},
    {kSPDRP_HARDWAREID, &CZKUMInfoDeviceImpl::HardwareId},
    {kSPDRP_PHYSICAL_DEVICE_OBJECT_NAME, &CZKUMInfoDeviceImpl::PhysicalName},
    {kSPDRP_ENUMERATOR_NAME, &CZKUMInfoDeviceImpl::EnumName}};

bool Read(ScriptedSets& sets, CZKUMInfoDeviceImpl& record) {
  PropertyBuffer buffer;
  return ReadInfoDeviceProperties(sets, 1, {}, buffer, record);
}

TEST(InfoDeviceProperties, FillTheirFields) {
  ScriptedSets sets;
  CZKUMInfoDeviceImpl record;
  std::list<std::u16string> texts;
  for (const auto& [property, field] : kTextFields) {
    texts.push_back(u"{0000000A " + std::u16string(property, u'x'));
    sets.values[property] = {.text = texts.back()};
  }
  // This is meant: the registry data types are stored, not the values.
  sets.values[kSPDRP_LEGACYBUSTYPE] = {.text = u"\x05", .type = kREG_DWORD};
  sets.values[kSPDRP_UI_NUMBER] = {.text = u"\x09", .type = kREG_MULTI_SZ};
  ASSERT_TRUE(Read(sets, record));
  for (const auto& [property, field] : kTextFields) {
    EXPECT_EQ(record.*field, sets.values[property].text) << property;
  }
  EXPECT_EQ(record.ClassGuid, (Guid{0xA, 0, 0, {}}));
  EXPECT_EQ(record.LegacyBusType, 4);
  EXPECT_EQ(record.UiNumber, 7);

  // What cannot be read stays, except service and class; what is empty becomes empty.
  sets.values.clear();
  sets.values[kSPDRP_MFG] = {.text = u""};
  sets.values[kSPDRP_DRIVER] = {.failure = 0};
  ASSERT_TRUE(Read(sets, record));
  for (const auto& [property, field] : kTextFields) {
    const bool emptied =
        property == kSPDRP_SERVICE || property == kSPDRP_CLASS || property == kSPDRP_MFG;
    EXPECT_EQ((record.*field).empty(), emptied) << property;
  }
  EXPECT_EQ(record.ClassGuid.Data1, 0xAu);
  EXPECT_EQ(record.LegacyBusType, 4);
  EXPECT_EQ(record.UiNumber, 7);
}

TEST(InfoDeviceProperties, ServicesExcludeIgnoringCaseAndClassesExactly) {
  struct Case {
    const char16_t *service, *deviceClass;
    bool accepted;
  };
  const Case cases[] = {{u"usbhub", u"USB", false},    {u"USBHUB", u"USB", false},
                        {u"http", u"", false},         {u"NULL", u"", false},
                        {u"sthda", u"", false},        {u"cdrom", u"", false},
                        {u"usbhub3", u"USB", true},    {u"usb", u"", true},
                        {u"disk", u"DiskDrive", true}, {u"", u"", true},
                        {u"", u"Monitor", false},      {u"", u"monitor", true},
                        {u"", u"Processor", false},    {u"", u"PROCESSOR", true},
                        {u"", u"Net", false},          {u"disk", u"LegacyDriver", false}};
  for (const Case& c : cases) {
    ScriptedSets sets;
    sets.values[kSPDRP_SERVICE] = {.text = c.service};
    sets.values[kSPDRP_CLASS] = {.text = c.deviceClass};
    sets.values[kSPDRP_FRIENDLYNAME] = {.text = u"name"};
    CZKUMInfoDeviceImpl record;
    EXPECT_EQ(Read(sets, record), c.accepted);
    // An excluded node leaves its properties behind, and this is meant.
    EXPECT_EQ(record.FriendlyName, u"name");
    EXPECT_EQ(record.DevClass, c.deviceClass);
  }
}

}  // namespace
}  // namespace KelvoUHW
