#include "devinfo/property_reader.h"

#include <algorithm>
#include <array>

#include "platform/text.h"

namespace KelvoUHW {

namespace {

constexpr std::array<std::u16string_view, 31> kExcludedServices{
    u"usbhub",  u"usbuhci", u"usbehci",  u"fdc",    u"flpydisk", u"cdrom",  u"imagedrv",
    u"pciide",  u"atapi",   u"HTTP",     u"IpNat",  u"IPSec",    u"kbdhid", u"ohci1394",
    u"mouhid",  u"Arp1394", u"Beep",     u"dmboot", u"dmload",   u"Gpc",    u"NDProxy",
    u"audstub", u"STHDA",   u"sysaudio", u"kmixer", u"splitter", u"aec",    u"swmidi",
    u"ialm",    u"wdmaud",  u"Null"};
constexpr std::array<std::u16string_view, 7> kExcludedClasses{
    u"Monitor", u"System", u"Ports", u"Net", u"Computer", u"LegacyDriver", u"Processor"};

// Longer than any instance id.
constexpr std::uint32_t kMostInstanceIdChars = 1U << 16;

// This is meant: services are compared ignoring case, classes exactly.
bool IsExcluded(std::u16string_view service, std::u16string_view deviceClass) noexcept {
  return std::ranges::any_of(kExcludedServices,
                             [&](std::u16string_view excluded) {
                               return platform::EqualIgnoringCase(service, excluded);
                             }) ||
         std::ranges::find(kExcludedClasses, deviceClass) != kExcludedClasses.end();
}

}  // namespace

void PropertyBuffer::Grow(std::uint32_t valueBytes) {
  const std::size_t chars = static_cast<std::size_t>(valueBytes) + 1;
  if (chars > m_bytes.size()) m_bytes.resize(chars);
}

void PropertyBuffer::SetReceived(std::uint32_t bytes) noexcept {
  m_received = std::min(bytes / sizeof(char16_t), m_bytes.size());
}

std::u16string_view PropertyBuffer::Text() const noexcept {
  return platform::UpToZero({m_bytes.data(), m_received});
}

platform::Status ReadDeviceProperty(platform::DeviceSets& sets, platform::DeviceSetHandle set,
                                    const platform::SP_DEVINFO_DATA& element,
                                    std::uint32_t property, std::uint32_t& type,
                                    PropertyBuffer& buffer) {
  platform::Status status;
  std::uint32_t offered = 0;
  for (int reads = 0; reads < kMostPropertyReads; ++reads) {
    std::uint32_t required = 0;
    status = sets.GetDeviceRegistryProperty(set, element, property, &type, buffer.Address(),
                                            offered, &required);
    if (status) {
      buffer.SetReceived(std::min(required, offered));
      return status;
    }
    if (status.error != platform::kERROR_INSUFFICIENT_BUFFER || required > kMostPropertyBytes)
      break;
    buffer.Grow(required);
    offered = required;
  }
  return status;
}

std::u16string GetInstanceId(platform::DeviceSets& sets, platform::DeviceSetHandle set,
                             const platform::SP_DEVINFO_DATA& element) {
  std::uint32_t length = 0;
  sets.GetDeviceInstanceId(set, element, nullptr, 0, &length);
  if (length == 0 || length > kMostInstanceIdChars) return {};
  std::u16string buffer(length + 1, u'\0');
  if (!sets.GetDeviceInstanceId(set, element, buffer.data(), length + 1, nullptr)) return {};
  return platform::Replaced(std::u16string(platform::UpToZero(buffer)), u'/', u'\\');
}

bool ReadInfoDeviceProperties(platform::DeviceSets& sets, platform::DeviceSetHandle set,
                              const platform::SP_DEVINFO_DATA& element, PropertyBuffer& buffer,
                              CZKUMInfoDeviceImpl& record) {
  std::uint32_t type = 0;
  const auto read = [&](std::uint32_t property) {
    return static_cast<bool>(ReadDeviceProperty(sets, set, element, property, type, buffer));
  };
  const auto readText = [&](std::uint32_t property, std::u16string& field) {
    if (read(property)) field = buffer.Text();
  };
  const auto readType = [&](std::uint32_t property, std::int32_t& field) {
    if (read(property)) field = static_cast<std::int32_t>(type);
  };

  record.Service.clear();
  readText(platform::kSPDRP_SERVICE, record.Service);
  record.DevClass.clear();
  readText(platform::kSPDRP_CLASS, record.DevClass);
  readText(platform::kSPDRP_DEVICEDESC, record.m_strDeviceDescr);
  if (read(platform::kSPDRP_CLASSGUID)) {
    record.ClassGuidText = buffer.Text();
    record.ClassGuid = ParseGuidText(record.ClassGuidText.c_str());
  }
  readText(platform::kSPDRP_DRIVER, record.m_strDriverKeyName);
  readText(platform::kSPDRP_FRIENDLYNAME, record.FriendlyName);
  readText(platform::kSPDRP_LOCATION_INFORMATION, record.Location);
  readText(platform::kSPDRP_MFG, record.Manufacturer);
  readType(platform::kSPDRP_LEGACYBUSTYPE, record.LegacyBusType);
  readText(platform::kSPDRP_HARDWAREID, record.HardwareId);
  readText(platform::kSPDRP_PHYSICAL_DEVICE_OBJECT_NAME, record.PhysicalName);
  readType(platform::kSPDRP_UI_NUMBER, record.UiNumber);
  readText(platform::kSPDRP_ENUMERATOR_NAME, record.EnumName);
  return !IsExcluded(record.Service, record.DevClass);
}

}  // namespace KelvoUHW
