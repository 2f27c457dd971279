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
// More than the 200 characters that an id has at most; others are asked for twice.
constexpr std::uint32_t kFirstInstanceIdChars = 256;

// Deliberate: services are compared ignoring case, classes exactly.
bool IsExcludedService(std::u16string_view service) noexcept {
  return std::ranges::any_of(kExcludedServices, [&](std::u16string_view excluded) {
    return platform::EqualIgnoringCase(service, excluded);
  });
}
bool IsExcludedClass(std::u16string_view deviceClass) noexcept {
  return std::ranges::find(kExcludedClasses, deviceClass) != kExcludedClasses.end();
}

}  // namespace

void PropertyBuffer::Grow(std::uint32_t valueBytes) {
  const std::size_t chars = (valueBytes + std::size_t{1}) / sizeof(char16_t) + 1;
  if (chars > m_chars.size()) m_chars.resize(chars);
}

void PropertyBuffer::SetReceived(std::uint32_t bytes) noexcept {
  m_received = std::min(bytes, Bytes());
  if (m_received % sizeof(char16_t) != 0) {
    reinterpret_cast<std::uint8_t*>(m_chars.data())[m_received] = 0;
  }
}

std::u16string_view PropertyBuffer::Chars() const noexcept {
  return {m_chars.data(), (m_received + std::size_t{1}) / sizeof(char16_t)};
}

platform::Status ReadDeviceProperty(platform::DeviceSets& sets, platform::DeviceSetHandle set,
                                    const platform::SP_DEVINFO_DATA& element,
                                    std::uint32_t property, std::uint32_t& type,
                                    PropertyBuffer& buffer) {
  platform::Status status;
  for (int reads = 0; reads < kMostPropertyReads; ++reads) {
    const std::uint32_t offered = buffer.Bytes();
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
  }
  return status;
}

std::u16string_view TextOf(const PropertyAnswer& answer) noexcept {
  return platform::UpToZero(answer.chars.substr(0, answer.bytes / sizeof(char16_t)));
}

std::optional<std::u16string_view> TextWithin(const PropertyAnswer& answer,
                                              std::uint32_t bufferBytes) noexcept {
  if (answer.bytes > bufferBytes) return std::nullopt;
  const std::u16string_view text = platform::UpToZero(answer.chars);
  if (text.size() == bufferBytes / sizeof(char16_t)) return std::nullopt;
  return text;
}

std::u16string GetInstanceId(platform::DeviceSets& sets, platform::DeviceSetHandle set,
                             const platform::SP_DEVINFO_DATA& element) {
  std::array<char16_t, kFirstInstanceIdChars> first{};
  std::uint32_t length = 0;
  if (sets.GetDeviceInstanceId(set, element, first.data(), kFirstInstanceIdChars, &length)) {
    const std::size_t chars = std::min<std::size_t>(length, first.size());
    return platform::Replaced(std::u16string(platform::UpToZero({first.data(), chars})), u'/',
                              u'\\');
  }
  if (length == 0 || length > kMostInstanceIdChars) return {};
  std::u16string buffer(length + 1, u'\0');
  if (!sets.GetDeviceInstanceId(set, element, buffer.data(), length + 1, nullptr)) return {};
  return platform::Replaced(std::u16string(platform::UpToZero(buffer)), u'/', u'\\');
}

platform::Status ElementReader::Ask(const platform::SP_DEVINFO_DATA& element,
                                    std::uint32_t property, PropertyAnswer& answer) {
  std::uint32_t type = 0;
  const platform::Status status =
      ReadDeviceProperty(m_sets, m_set, element, property, type, m_buffer);
  answer = {};
  if (status) {
    answer = {true, type, m_buffer.Received(), m_buffer.Chars()};
  } else if (status.error != platform::kERROR_INVALID_DATA) {
    ++m_failures;
  }
  return status;
}

bool ElementReader::Read(const platform::SP_DEVINFO_DATA& element, std::uint32_t property,
                         PropertyAnswer& answer) {
  if (!m_answers.FindProperty(element.DevInst, property, answer)) Ask(element, property, answer);
  return answer.has;
}

bool ElementReader::ReadAndKeep(const platform::SP_DEVINFO_DATA& element, std::uint32_t property,
                                PropertyAnswer& answer) {
  const platform::Status status = Ask(element, property, answer);
  if (status || status.error == platform::kERROR_INVALID_DATA) {
    m_answers.KeepProperty(element.DevInst, property, answer);
  }
  return answer.has;
}

bool ReadClass(ElementReader& reader, const platform::SP_DEVINFO_DATA& element,
               CZKUMInfoDeviceImpl& record) {
  PropertyAnswer answer;
  record.DevClass.clear();
  if (reader.Read(element, platform::kSPDRP_CLASS, answer))
    record.DevClass = reader.Texts().Of(TextOf(answer));
  return !IsExcludedClass(record.DevClass);
}

bool ReadService(ElementReader& reader, const platform::SP_DEVINFO_DATA& element,
                 CZKUMInfoDeviceImpl& record) {
  PropertyAnswer answer;
  record.Service.clear();
  if (reader.Read(element, platform::kSPDRP_SERVICE, answer))
    record.Service = reader.Texts().Of(TextOf(answer));
  return !IsExcludedService(record.Service);
}

bool PassedElements::IsExcluded(ElementReader& reader, Passed& passed) {
  if (passed.kind == Kind::Unwanted) {
    PropertyAnswer answer;
    const bool excluded = reader.Read(passed.element, platform::kSPDRP_SERVICE, answer) &&
                          IsExcludedService(TextOf(answer));
    passed.kind = excluded ? Kind::Excluded : Kind::Rejected;
  }
  return passed.kind == Kind::Excluded;
}

bool PassedElements::Read(ElementReader& reader, std::uint32_t property, PropertyAnswer& answer) {
  const bool outlastsRejection = property == platform::kSPDRP_LOCATION_INFORMATION ||
                                 property == platform::kSPDRP_ENUMERATOR_NAME;
  for (auto passed = m_elements.rbegin(); passed != m_elements.rend(); ++passed) {
    if (!outlastsRejection && !IsExcluded(reader, *passed)) return false;
    if (reader.Read(passed->element, property, answer)) return true;
  }
  return false;
}

std::u16string PassedElements::SerialNumber(ElementReader& reader) {
  for (auto passed = m_elements.rbegin(); passed != m_elements.rend(); ++passed) {
    if (IsExcluded(reader, *passed)) continue;
    NodeIdentity identity;
    identity.SetInstanceId(reader.InstanceId(passed->element));
    if (!identity.m_strSerialNumber.empty()) return identity.m_strSerialNumber;
  }
  return {};
}

void ReadOtherProperties(ElementReader& reader, const platform::SP_DEVINFO_DATA& element,
                         PassedElements& passed, CZKUMInfoDeviceImpl& record) {
  PropertyAnswer answer;
  const auto read = [&](std::uint32_t property) {
    return reader.Read(element, property, answer) || passed.Read(reader, property, answer);
  };
  const auto readText = [&](std::uint32_t property, std::u16string& field) {
    if (read(property)) field = TextOf(answer);
  };
  const auto readShared = [&](std::uint32_t property, SharedText& field) {
    if (read(property)) field = reader.Texts().Of(TextOf(answer));
  };
  const auto readType = [&](std::uint32_t property, std::int32_t& field) {
    if (read(property)) field = static_cast<std::int32_t>(answer.type);
  };

  readText(platform::kSPDRP_DEVICEDESC, record.m_strDeviceDescr);
  if (read(platform::kSPDRP_CLASSGUID)) {
    record.ClassGuidText = reader.Texts().Of(TextOf(answer));
    record.ClassGuid = ParseGuidText(record.ClassGuidText.c_str());
  }
  readText(platform::kSPDRP_DRIVER, record.m_strDriverKeyName);
  readShared(platform::kSPDRP_FRIENDLYNAME, record.FriendlyName);
  readText(platform::kSPDRP_LOCATION_INFORMATION, record.Location);
  readShared(platform::kSPDRP_MFG, record.Manufacturer);
  readType(platform::kSPDRP_LEGACYBUSTYPE, record.LegacyBusType);
  readShared(platform::kSPDRP_HARDWAREID, record.HardwareId);
  readText(platform::kSPDRP_PHYSICAL_DEVICE_OBJECT_NAME, record.PhysicalName);
  readType(platform::kSPDRP_UI_NUMBER, record.UiNumber);
  readShared(platform::kSPDRP_ENUMERATOR_NAME, record.EnumName);
}

}  // namespace KelvoUHW
