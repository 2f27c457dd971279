#include "records/interface_entry.h"

#include <algorithm>

#include "platform/usb_ioctl.h"

namespace KelvoUHW {

namespace {

constexpr std::size_t kIndexOfInterfaceString = 8;

// The bytes that belong to the configuration, of those received.
RawDescriptor ConfigurationBytes(RawDescriptor data) noexcept {
  constexpr std::size_t kEndOfTotalLength = 4;
  if (data.size() < kEndOfTotalLength || data[0] < kEndOfTotalLength ||
      data[1] != platform::kUSB_CONFIGURATION_DESCRIPTOR_TYPE) {
    return data;
  }
  const auto total = static_cast<std::size_t>(data[2] | data[3] << 8);
  return data.first(std::min(data.size(), total));
}

bool IsInterface(RawDescriptor bytes) noexcept {
  return bytes.size() >= 2 && bytes[1] == platform::kUSB_INTERFACE_DESCRIPTOR_TYPE &&
         (bytes[0] == 9 || bytes[0] == 11) && bytes.size() == bytes[0];
}

}  // namespace

std::vector<RawDescriptor> SplitConfiguration(std::span<const std::uint8_t> data) {
  std::vector<RawDescriptor> result;
  RawDescriptor rest = ConfigurationBytes(data);
  while (rest.size() >= 2 && rest[0] >= 2) {
    result.push_back(rest.first(std::min<std::size_t>(rest[0], rest.size())));
    rest = rest.subspan(result.back().size());
  }
  return result;
}

std::vector<InterfaceEntryPtr> MakeInterfaceEntries(std::span<const RawDescriptor> descriptors,
                                                    const StringDescriptorNode* strings) {
  std::vector<InterfaceEntryPtr> entries;
  for (const RawDescriptor& bytes : descriptors) {
    if (!IsInterface(bytes)) continue;
    auto entry = MakeRecord<InterfaceEntry>();
    entry->Descriptor.assign(bytes.begin(), bytes.end());
    if (const auto* found = FindStringDescriptor(strings, bytes[kIndexOfInterfaceString])) {
      entry->String = InterfaceEntry::Text{found->LanguageID, found->Text()};
    }
    entries.push_back(std::move(entry));
  }
  return entries;
}

}  // namespace KelvoUHW
