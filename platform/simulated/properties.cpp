#include "platform/simulated/properties.h"

#include "platform/setup_api.h"

namespace platform::simulated {
namespace {

void AppendText(std::vector<std::uint8_t>& bytes, const Text& text) {
  const auto* first = reinterpret_cast<const std::uint8_t*>(text.c_str());
  bytes.insert(bytes.end(), first, first + (text.size() + 1) * sizeof(char16_t));
}

std::optional<PropertyValue> TextValue(const std::optional<Text>& text) {
  if (!text) return std::nullopt;
  PropertyValue value{kREG_SZ, {}};
  AppendText(value.bytes, *text);
  return value;
}

std::optional<PropertyValue> ListValue(const std::optional<std::vector<Text>>& texts) {
  if (!texts) return std::nullopt;
  PropertyValue value{kREG_MULTI_SZ, {}};
  for (const Text& text : *texts) AppendText(value.bytes, text);
  AppendText(value.bytes, Text());
  return value;
}

template <class Number>
std::optional<PropertyValue> NumberValue(const std::optional<Number>& number) {
  static_assert(sizeof(Number) == 4);
  if (!number) return std::nullopt;
  const auto* first = reinterpret_cast<const std::uint8_t*>(&*number);
  return PropertyValue{kREG_DWORD, {first, first + sizeof(Number)}};
}

}  // namespace

std::optional<PropertyValue> PropertyOf(const Device& device, std::uint32_t property) {
  switch (property) {
    case kSPDRP_DEVICEDESC:
      return TextValue(device.description);
    case kSPDRP_HARDWAREID:
      return ListValue(device.hardwareIds);
    case kSPDRP_SERVICE:
      return TextValue(device.service);
    case kSPDRP_CLASS:
      return TextValue(device.deviceClass);
    case kSPDRP_CLASSGUID:
      return TextValue(device.classGuid);
    case kSPDRP_DRIVER:
      return TextValue(device.driver);
    case kSPDRP_MFG:
      return TextValue(device.manufacturer);
    case kSPDRP_FRIENDLYNAME:
      return TextValue(device.friendlyName);
    case kSPDRP_LOCATION_INFORMATION:
      return TextValue(device.location);
    case kSPDRP_PHYSICAL_DEVICE_OBJECT_NAME:
      return TextValue(device.physicalName);
    case kSPDRP_UI_NUMBER:
      return NumberValue(device.uiNumber);
    case kSPDRP_LEGACYBUSTYPE:
      return NumberValue(device.legacyBusType);
    case kSPDRP_ENUMERATOR_NAME:
      return TextValue(device.enumerator);
    default:
      return std::nullopt;
  }
}

}  // namespace platform::simulated
