#include <cstring>
#include <optional>

#include "platform/text.h"
#include "simulation/pc/class_table.h"
#include "simulation/pc/state.h"

namespace platform::simulated {
namespace {

constexpr std::uint32_t kERROR_INVALID_CLASS = 0xE0000206;
constexpr std::uint32_t kERROR_NO_SUCH_DEVINST = 0xE000020B;
constexpr std::uint32_t kERROR_NO_SUCH_DEVICE_INTERFACE = 0xE0000225;

// An element's Reserved field: its position in the set, counted from one.
SystemWord ReservedOf(std::size_t position) { return static_cast<SystemWord>(position + 1); }

void FillDevice(const SetContents& contents, std::size_t position, SP_DEVINFO_DATA& data) {
  const SetContents::DeviceElement& element = contents.devices[position];
  data.ClassGuid = element.classGuid;
  data.DevInst = element.number;
  data.Reserved = ReservedOf(position);
}

// The device an element stands for, as it is now. An element of another set, or of a device that
// has gone since the set was taken, has none.
Status FindDevice(const IndexedMachine& now, const SetContents& contents,
                  const SP_DEVINFO_DATA& data, MachineIndex::Position& device) {
  if (data.cbSize != sizeof(SP_DEVINFO_DATA)) return Status::Failure(kERROR_INVALID_USER_BUFFER);
  const bool isElement = data.Reserved != 0 && data.Reserved <= contents.devices.size() &&
                         contents.devices[data.Reserved - 1].number == data.DevInst;
  if (!isElement) return Status::Failure(kERROR_NO_SUCH_DEVINST);
  device = now.index.DeviceByNumber(data.DevInst);
  if (device == MachineIndex::kNone) return Status::Failure(kERROR_NO_SUCH_DEVINST);
  return Status::Success();
}

Status GiveText(std::u16string_view text, char16_t* buffer, std::uint32_t bufferChars,
                std::uint32_t* required) {
  const std::size_t needed = text.size() + 1;
  if (required != nullptr) *required = static_cast<std::uint32_t>(needed);
  if (buffer == nullptr || bufferChars < needed) {
    return Status::Failure(kERROR_INSUFFICIENT_BUFFER);
  }
  text.copy(buffer, text.size());
  buffer[text.size()] = u'\0';
  return Status::Success();
}

}  // namespace

Status SimulatedPc::GetClassDevs(const Guid* guid, std::uint32_t flags,
                                 DeviceSetHandle& set) noexcept {
  const std::lock_guard lock(m_state->mutex);
  const bool interfaces = (flags & kDIGCF_DEVICEINTERFACE) != 0;
  const Guid* wanted = (flags & kDIGCF_ALLCLASSES) != 0 ? nullptr : guid;
  Text name = interfaces ? u"interfaces" : u"devices";
  if (wanted != nullptr) name.append(u" ").append(GuidText(*wanted));
  const MachineIndex& index = m_state->now->index;
  set = m_state->handles.Open(
      OpenSet{interfaces ? index.Interfaces(wanted) : index.Devices(wanted)}, name);
  return Status::Success();
}

Status SimulatedPc::EnumDeviceInfo(DeviceSetHandle set, std::uint32_t index,
                                   SP_DEVINFO_DATA& data) noexcept {
  const std::lock_guard lock(m_state->mutex);
  const auto* open = m_state->handles.Find<OpenSet>(set);
  if (open == nullptr) return Status::Failure(kERROR_INVALID_HANDLE);
  if (data.cbSize != sizeof(data)) return Status::Failure(kERROR_INVALID_USER_BUFFER);
  if (index >= open->contents->devices.size()) return Status::Failure(kERROR_NO_MORE_ITEMS);
  FillDevice(*open->contents, index, data);
  return Status::Success();
}

Status SimulatedPc::EnumDeviceInterfaces(DeviceSetHandle set, const Guid& interfaceClass,
                                         std::uint32_t index,
                                         SP_DEVICE_INTERFACE_DATA& data) noexcept {
  constexpr std::uint32_t kSPINT_ACTIVE = 1;
  const std::lock_guard lock(m_state->mutex);
  const auto* open = m_state->handles.Find<OpenSet>(set);
  if (open == nullptr) return Status::Failure(kERROR_INVALID_HANDLE);
  if (data.cbSize != sizeof(data)) return Status::Failure(kERROR_INVALID_USER_BUFFER);
  const auto ofClass = open->contents->byClass.find(interfaceClass);
  if (ofClass == open->contents->byClass.end() || index >= ofClass->second.size()) {
    return Status::Failure(kERROR_NO_MORE_ITEMS);
  }
  data.InterfaceClassGuid = interfaceClass;
  data.Flags = kSPINT_ACTIVE;
  data.Reserved = ReservedOf(ofClass->second[index]);
  return Status::Success();
}

Status SimulatedPc::GetDeviceInterfaceDetail(DeviceSetHandle set,
                                             const SP_DEVICE_INTERFACE_DATA& data, void* detail,
                                             std::uint32_t detailBytes, std::uint32_t* required,
                                             SP_DEVINFO_DATA* device) noexcept {
  const std::lock_guard lock(m_state->mutex);
  const auto* open = m_state->handles.Find<OpenSet>(set);
  if (open == nullptr) return Status::Failure(kERROR_INVALID_HANDLE);
  if (data.cbSize != sizeof(data) || (device != nullptr && device->cbSize != sizeof(*device))) {
    return Status::Failure(kERROR_INVALID_USER_BUFFER);
  }
  if (detail == nullptr) {
    if (detailBytes != 0) return Status::Failure(kERROR_INVALID_USER_BUFFER);
  } else {
    std::uint32_t size = 0;
    if (detailBytes >= kInterfaceDetailSize) std::memcpy(&size, detail, sizeof(size));
    if (size != kInterfaceDetailSize) return Status::Failure(kERROR_INVALID_USER_BUFFER);
  }
  const SetContents& contents = *open->contents;
  const std::size_t position = data.Reserved - std::size_t{1};
  if (position >= contents.interfaces.size() ||
      contents.interfaces[position].interfaceClass != data.InterfaceClassGuid) {
    return Status::Failure(kERROR_NO_SUCH_DEVICE_INTERFACE);
  }
  const SetContents::InterfaceElement& element = contents.interfaces[position];
  if (m_state->now->index.DeviceByNumber(contents.devices[element.device].number) ==
      MachineIndex::kNone) {
    return Status::Failure(kERROR_NO_SUCH_DEVINST);
  }
  const std::size_t pathBytes = (element.path.size() + 1) * sizeof(char16_t);
  const auto needed = static_cast<std::uint32_t>(kInterfaceDetailPathOffset + pathBytes);
  if (required != nullptr) *required = needed;
  // The element is told even where the path does not fit: asking for it alone is a way to use this.
  if (device != nullptr) FillDevice(contents, element.device, *device);
  if (detail == nullptr || detailBytes < needed) {
    return Status::Failure(kERROR_INSUFFICIENT_BUFFER);
  }
  std::memcpy(static_cast<std::uint8_t*>(detail) + kInterfaceDetailPathOffset, element.path.c_str(),
              pathBytes);
  return Status::Success();
}

Status SimulatedPc::GetDeviceInstanceId(DeviceSetHandle set, const SP_DEVINFO_DATA& data,
                                        char16_t* buffer, std::uint32_t bufferChars,
                                        std::uint32_t* required) noexcept {
  const std::lock_guard lock(m_state->mutex);
  const auto* open = m_state->handles.Find<OpenSet>(set);
  if (open == nullptr) return Status::Failure(kERROR_INVALID_HANDLE);
  MachineIndex::Position device = MachineIndex::kNone;
  if (const Status found = FindDevice(*m_state->now, *open->contents, data, device); !found) {
    return found;
  }
  return GiveText(m_state->now->properties.Id(device), buffer, bufferChars, required);
}

Status SimulatedPc::GetDeviceRegistryProperty(DeviceSetHandle set, const SP_DEVINFO_DATA& data,
                                              std::uint32_t property, std::uint32_t* type,
                                              void* buffer, std::uint32_t bufferBytes,
                                              std::uint32_t* required) noexcept {
  const std::lock_guard lock(m_state->mutex);
  const auto* open = m_state->handles.Find<OpenSet>(set);
  if (open == nullptr) return Status::Failure(kERROR_INVALID_HANDLE);
  if (buffer == nullptr && bufferBytes != 0) return Status::Failure(kERROR_INVALID_PARAMETER);
  MachineIndex::Position device = MachineIndex::kNone;
  if (const Status found = FindDevice(*m_state->now, *open->contents, data, device); !found) {
    return found;
  }
  const std::optional<PropertyValue> value = m_state->now->properties.Value(device, property);
  if (!value) return Status::Failure(kERROR_INVALID_DATA);
  if (type != nullptr) *type = value->type;
  if (required != nullptr) *required = static_cast<std::uint32_t>(value->bytes.size());
  if (bufferBytes < value->bytes.size()) return Status::Failure(kERROR_INSUFFICIENT_BUFFER);
  std::memcpy(buffer, value->bytes.data(), value->bytes.size());
  return Status::Success();
}

Status SimulatedPc::DestroyDeviceInfoList(DeviceSetHandle set) noexcept {
  const std::lock_guard lock(m_state->mutex);
  return m_state->handles.Close<OpenSet>(set);
}

Status SimulatedPc::GetClassImageList(DeviceSetHandle& imageList) noexcept {
  const std::lock_guard lock(m_state->mutex);
  imageList = m_state->handles.Open(OpenImageList{}, Text());
  return Status::Success();
}

Status SimulatedPc::GetClassImageIndex(DeviceSetHandle imageList, const Guid& classGuid,
                                       std::int32_t& index) noexcept {
  const std::lock_guard lock(m_state->mutex);
  if (m_state->handles.Find<OpenImageList>(imageList) == nullptr) {
    return Status::Failure(kERROR_INVALID_HANDLE);
  }
  const ClassInfo* info = m_state->now->index.Class(classGuid);
  if (info == nullptr || !info->hasImage) return Status::Failure(kERROR_INVALID_CLASS);
  index = 0;
  return Status::Success();
}

Status SimulatedPc::DestroyClassImageList(DeviceSetHandle imageList) noexcept {
  const std::lock_guard lock(m_state->mutex);
  return m_state->handles.Close<OpenImageList>(imageList);
}

Status SimulatedPc::GetClassDescription(const Guid& classGuid, char16_t* buffer,
                                        std::uint32_t bufferChars,
                                        std::uint32_t* required) noexcept {
  const std::lock_guard lock(m_state->mutex);
  const ClassInfo* info = m_state->now->index.Class(classGuid);
  if (info == nullptr || !info->hasDescription) return Status::Failure(kERROR_INVALID_CLASS);
  const std::u16string_view known = WellKnownClassDescription(classGuid);
  return GiveText(known.empty() ? std::u16string_view(info->name) : known, buffer, bufferChars,
                  required);
}

}  // namespace platform::simulated
