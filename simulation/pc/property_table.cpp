#include "simulation/pc/property_table.h"

#include <string>
#include <unordered_map>

#include "platform/setup_api.h"

namespace platform::simulated {
namespace {

using ValueBytes = std::string;  // which has a hash
using Values = std::optional<ValueBytes> (*)(const Device&);

ValueBytes BytesOf(const Text& text) {
  return {reinterpret_cast<const char*>(text.c_str()), (text.size() + 1) * sizeof(char16_t)};
}

template <auto kMember>
std::optional<ValueBytes> TextValue(const Device& device) {
  if (!(device.*kMember)) return std::nullopt;
  return BytesOf(*(device.*kMember));
}

template <auto kMember>
std::optional<ValueBytes> ListValue(const Device& device) {
  if (!(device.*kMember)) return std::nullopt;
  ValueBytes bytes;
  for (const Text& text : *(device.*kMember)) bytes += BytesOf(text);
  return bytes += BytesOf(Text());
}

template <auto kMember>
std::optional<ValueBytes> NumberValue(const Device& device) {
  if (!(device.*kMember)) return std::nullopt;
  static_assert(sizeof(*(device.*kMember)) == 4);
  return ValueBytes(reinterpret_cast<const char*>(&*(device.*kMember)), 4);
}

struct Property {
  std::uint32_t number;
  std::uint32_t type;
  Values values;
};

constexpr std::array kKnown = {
    Property{kSPDRP_DEVICEDESC, kREG_SZ, TextValue<&Device::description>},
    Property{kSPDRP_HARDWAREID, kREG_MULTI_SZ, ListValue<&Device::hardwareIds>},
    Property{kSPDRP_SERVICE, kREG_SZ, TextValue<&Device::service>},
    Property{kSPDRP_CLASS, kREG_SZ, TextValue<&Device::deviceClass>},
    Property{kSPDRP_CLASSGUID, kREG_SZ, TextValue<&Device::classGuid>},
    Property{kSPDRP_DRIVER, kREG_SZ, TextValue<&Device::driver>},
    Property{kSPDRP_MFG, kREG_SZ, TextValue<&Device::manufacturer>},
    Property{kSPDRP_FRIENDLYNAME, kREG_SZ, TextValue<&Device::friendlyName>},
    Property{kSPDRP_LOCATION_INFORMATION, kREG_SZ, TextValue<&Device::location>},
    Property{kSPDRP_PHYSICAL_DEVICE_OBJECT_NAME, kREG_SZ, TextValue<&Device::physicalName>},
    Property{kSPDRP_UI_NUMBER, kREG_DWORD, NumberValue<&Device::uiNumber>},
    Property{kSPDRP_LEGACYBUSTYPE, kREG_DWORD, NumberValue<&Device::legacyBusType>},
    Property{kSPDRP_ENUMERATOR_NAME, kREG_SZ, TextValue<&Device::enumerator>},
};

}  // namespace

PropertyTable::PropertyTable(const std::vector<Device>& devices) {
  static_assert(kKnown.size() == kProperties);
  for (std::size_t i = 0; i < kKnown.size(); ++i) {
    std::unordered_map<ValueBytes, std::uint32_t> offsets;
    m_places[i].reserve(devices.size());
    for (const Device& device : devices) {
      const std::optional<ValueBytes> value = kKnown[i].values(device);
      if (!value) {
        m_places[i].push_back({0, 0});
        continue;
      }
      const auto [known, fresh] =
          offsets.try_emplace(*value, static_cast<std::uint32_t>(m_bytes.size()));
      if (fresh) m_bytes.insert(m_bytes.end(), value->begin(), value->end());
      m_places[i].push_back({known->second, static_cast<std::uint32_t>(value->size())});
    }
  }
  for (const Device& device : devices) {
    m_ids += device.id;
    m_idEnds.push_back(m_ids.size());
  }
}

std::optional<PropertyValue> PropertyTable::Value(std::size_t device,
                                                  std::uint32_t property) const {
  for (std::size_t i = 0; i < kKnown.size(); ++i) {
    if (kKnown[i].number != property) continue;
    const Place place = m_places[i][device];
    if (place.size == 0) return std::nullopt;
    return PropertyValue{kKnown[i].type, std::span(m_bytes).subspan(place.offset, place.size)};
  }
  return std::nullopt;
}

std::u16string_view PropertyTable::Id(std::size_t device) const {
  const std::size_t begin = device == 0 ? 0 : m_idEnds[device - 1];
  return std::u16string_view(m_ids).substr(begin, m_idEnds[device] - begin);
}

}  // namespace platform::simulated
