#include "bench/recording_host.h"

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <optional>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

namespace bench {
namespace {

using namespace platform;

// What a repetition writes into, and the handles that it was given.
struct Replaying {
  explicit Replaying(std::size_t slots) : handles(slots, kInvalidHandle) {}

  // A buffer of at least that size; what earlier calls left in it stays there.
  void* Bytes(std::size_t size) {
    if (m_buffer.size() < size) m_buffer.resize(size);
    return m_buffer.data();
  }
  char16_t* Chars(std::size_t count) {
    return static_cast<char16_t*>(Bytes(count * sizeof(char16_t)));
  }

  std::vector<std::intptr_t> handles;
  std::uint32_t number = 0;
  std::uint32_t otherNumber = 0;
  std::int32_t index = 0;
  SP_DEVINFO_DATA element{.cbSize = sizeof(SP_DEVINFO_DATA)};
  SP_DEVICE_INTERFACE_DATA interfaceElement{.cbSize = sizeof(SP_DEVICE_INTERFACE_DATA)};

 private:
  std::vector<std::uint8_t> m_buffer = std::vector<std::uint8_t>(std::size_t{1} << 16);
};

std::u16string TextOf(const char16_t* text) { return text == nullptr ? u"" : text; }

}  // namespace

class Recording::Recorder final : public platform::Host {
 public:
  platform::Host* base = nullptr;

  void Clear() {
    m_calls.clear();
    m_slots.clear();
    m_slotCount = 0;
  }
  std::size_t Calls() const noexcept { return m_calls.size(); }
  std::size_t Replay(platform::Host& host) const {
    Replaying replaying(m_slotCount);
    return static_cast<std::size_t>(std::count_if(
        m_calls.begin(), m_calls.end(),
        [&](const Call& call) { return call.repeat(host, replaying) != call.succeeded; }));
  }

  Status OpenDevice(const char16_t* path, std::uint32_t access, std::uint32_t share,
                    FileHandle& handle) noexcept override {
    return AddOpening(base->OpenDevice(path, access, share, handle), handle,
                      [path = TextOf(path), access, share](auto& host, auto&, auto& given) {
                        return host.OpenDevice(path.c_str(), access, share, given);
                      });
  }
  Status DeviceControl(FileHandle file, std::uint32_t code, const void* in, std::uint32_t inBytes,
                       void* out, std::uint32_t outBytes,
                       std::uint32_t& returned) noexcept override {
    std::vector<std::uint8_t> input(inBytes);
    if (inBytes != 0) std::memcpy(input.data(), in, inBytes);
    return Add(base->DeviceControl(file, code, in, inBytes, out, outBytes, returned),
               [slot = SlotOf(file), code, input = std::move(input), hasIn = in != nullptr,
                outBytes](auto& host, auto& to) {
                 const auto inSize = static_cast<std::uint32_t>(input.size());
                 void* buffer = to.Bytes(std::max(inSize, outBytes));
                 if (inSize != 0) std::memcpy(buffer, input.data(), inSize);
                 return host.DeviceControl(Of(slot, to), code, hasIn ? buffer : nullptr, inSize,
                                           buffer, outBytes, to.number);
               });
  }
  Status CloseDevice(FileHandle file) noexcept override {
    return Add(base->CloseDevice(file), [slot = SlotOf(file)](auto& host, auto& to) {
      return host.CloseDevice(Of(slot, to));
    });
  }

  Status GetClassDevs(const Guid* guid, std::uint32_t flags,
                      DeviceSetHandle& set) noexcept override {
    return AddOpening(base->GetClassDevs(guid, flags, set), set,
                      [wanted = guid ? std::optional(*guid) : std::nullopt, flags](
                          auto& host, auto&, auto& given) {
                        return host.GetClassDevs(wanted ? &*wanted : nullptr, flags, given);
                      });
  }
  Status EnumDeviceInfo(DeviceSetHandle set, std::uint32_t index,
                        SP_DEVINFO_DATA& data) noexcept override {
    return Add(base->EnumDeviceInfo(set, index, data),
               [slot = SlotOf(set), index](auto& host, auto& to) {
                 return host.EnumDeviceInfo(Of(slot, to), index, to.element);
               });
  }
  Status EnumDeviceInterfaces(DeviceSetHandle set, const Guid& interfaceClass, std::uint32_t index,
                              SP_DEVICE_INTERFACE_DATA& data) noexcept override {
    return Add(base->EnumDeviceInterfaces(set, interfaceClass, index, data),
               [slot = SlotOf(set), interfaceClass, index](auto& host, auto& to) {
                 return host.EnumDeviceInterfaces(Of(slot, to), interfaceClass, index,
                                                  to.interfaceElement);
               });
  }
  Status GetDeviceInterfaceDetail(DeviceSetHandle set, const SP_DEVICE_INTERFACE_DATA& data,
                                  void* detail, std::uint32_t detailBytes, std::uint32_t* required,
                                  SP_DEVINFO_DATA* device) noexcept override {
    return Add(base->GetDeviceInterfaceDetail(set, data, detail, detailBytes, required, device),
               [slot = SlotOf(set), data, hasDetail = detail != nullptr, detailBytes,
                hasDevice = device != nullptr](auto& host, auto& to) {
                 void* buffer = to.Bytes(detailBytes);
                 const std::uint32_t fixedPart = kInterfaceDetailSize;
                 std::memcpy(buffer, &fixedPart, sizeof fixedPart);
                 return host.GetDeviceInterfaceDetail(
                     Of(slot, to), data, hasDetail ? buffer : nullptr, detailBytes, &to.number,
                     hasDevice ? &to.element : nullptr);
               });
  }
  Status GetDeviceInstanceId(DeviceSetHandle set, const SP_DEVINFO_DATA& data, char16_t* buffer,
                             std::uint32_t chars, std::uint32_t* required) noexcept override {
    return Add(base->GetDeviceInstanceId(set, data, buffer, chars, required),
               [slot = SlotOf(set), data, has = buffer != nullptr, chars](auto& host, auto& to) {
                 return host.GetDeviceInstanceId(
                     Of(slot, to), data, has ? to.Chars(chars) : nullptr, chars, &to.number);
               });
  }
  Status GetDeviceRegistryProperty(DeviceSetHandle set, const SP_DEVINFO_DATA& data,
                                   std::uint32_t property, std::uint32_t* type, void* buffer,
                                   std::uint32_t bytes, std::uint32_t* required) noexcept override {
    return Add(
        base->GetDeviceRegistryProperty(set, data, property, type, buffer, bytes, required),
        [slot = SlotOf(set), data, property, has = buffer != nullptr, bytes](auto& host, auto& to) {
          return host.GetDeviceRegistryProperty(Of(slot, to), data, property, &to.otherNumber,
                                                has ? to.Bytes(bytes) : nullptr, bytes, &to.number);
        });
  }
  Status DestroyDeviceInfoList(DeviceSetHandle set) noexcept override {
    return Add(base->DestroyDeviceInfoList(set), [slot = SlotOf(set)](auto& host, auto& to) {
      return host.DestroyDeviceInfoList(Of(slot, to));
    });
  }
  Status GetClassImageList(DeviceSetHandle& list) noexcept override {
    return AddOpening(base->GetClassImageList(list), list,
                      [](auto& host, auto&, auto& given) { return host.GetClassImageList(given); });
  }
  Status GetClassImageIndex(DeviceSetHandle list, const Guid& classGuid,
                            std::int32_t& index) noexcept override {
    return Add(base->GetClassImageIndex(list, classGuid, index),
               [slot = SlotOf(list), classGuid](auto& host, auto& to) {
                 return host.GetClassImageIndex(Of(slot, to), classGuid, to.index);
               });
  }
  Status DestroyClassImageList(DeviceSetHandle list) noexcept override {
    return Add(base->DestroyClassImageList(list), [slot = SlotOf(list)](auto& host, auto& to) {
      return host.DestroyClassImageList(Of(slot, to));
    });
  }
  Status GetClassDescription(const Guid& classGuid, char16_t* buffer, std::uint32_t chars,
                             std::uint32_t* required) noexcept override {
    return Add(base->GetClassDescription(classGuid, buffer, chars, required),
               [classGuid, chars](auto& host, auto& to) {
                 return host.GetClassDescription(classGuid, to.Chars(chars), chars, &to.number);
               });
  }

  Status LocateRootDevNode(DevInst& node) noexcept override {
    return Add(base->LocateRootDevNode(node),
               [](auto& host, auto& to) { return host.LocateRootDevNode(to.number); });
  }
  Status GetParent(DevInst node, DevInst& parent) noexcept override {
    return Add(base->GetParent(node, parent),
               [node](auto& host, auto& to) { return host.GetParent(node, to.number); });
  }
  Status GetChild(DevInst node, DevInst& child) noexcept override {
    return Add(base->GetChild(node, child),
               [node](auto& host, auto& to) { return host.GetChild(node, to.number); });
  }
  Status GetSibling(DevInst node, DevInst& sibling) noexcept override {
    return Add(base->GetSibling(node, sibling),
               [node](auto& host, auto& to) { return host.GetSibling(node, to.number); });
  }
  Status GetDeviceId(DevInst node, char16_t* buffer, std::uint32_t chars) noexcept override {
    return Add(base->GetDeviceId(node, buffer, chars), [node, chars](auto& host, auto& to) {
      return host.GetDeviceId(node, to.Chars(chars), chars);
    });
  }
  Status GetDevNodeRegistryProperty(DevInst node, std::uint32_t property, std::uint32_t* type,
                                    void* buffer, std::uint32_t& bytes) noexcept override {
    const std::uint32_t size = bytes;
    return Add(base->GetDevNodeRegistryProperty(node, property, type, buffer, bytes),
               [node, property, size](auto& host, auto& to) {
                 to.number = size;
                 return host.GetDevNodeRegistryProperty(node, property, &to.otherNumber,
                                                        to.Bytes(size), to.number);
               });
  }

  Status FirstVolume(char16_t* name, std::uint32_t chars, FindHandle& search) noexcept override {
    return AddOpening(base->FirstVolume(name, chars, search), search,
                      [chars](auto& host, auto& to, auto& given) {
                        return host.FirstVolume(to.Chars(chars), chars, given);
                      });
  }
  Status NextVolume(FindHandle search, char16_t* name, std::uint32_t chars) noexcept override {
    return Add(base->NextVolume(search, name, chars),
               [slot = SlotOf(search), chars](auto& host, auto& to) {
                 return host.NextVolume(Of(slot, to), to.Chars(chars), chars);
               });
  }
  Status CloseVolumeSearch(FindHandle search) noexcept override {
    return Add(base->CloseVolumeSearch(search), [slot = SlotOf(search)](auto& host, auto& to) {
      return host.CloseVolumeSearch(Of(slot, to));
    });
  }
  Status VolumePathNames(const char16_t* name, char16_t* names, std::uint32_t chars,
                         std::uint32_t& required) noexcept override {
    return Add(base->VolumePathNames(name, names, chars, required),
               [name = TextOf(name), chars](auto& host, auto& to) {
                 return host.VolumePathNames(name.c_str(), to.Chars(chars), chars, to.number);
               });
  }
  Status VolumeNameForMountPoint(const char16_t* path, char16_t* name,
                                 std::uint32_t chars) noexcept override {
    return Add(base->VolumeNameForMountPoint(path, name, chars),
               [path = TextOf(path), chars](auto& host, auto& to) {
                 return host.VolumeNameForMountPoint(path.c_str(), to.Chars(chars), chars);
               });
  }
  std::uint32_t LogicalDriveStrings(std::uint32_t chars, char16_t* buffer) noexcept override {
    const std::uint32_t written = base->LogicalDriveStrings(chars, buffer);
    Add({written != 0, 0}, [chars](auto& host, auto& to) {
      return Status{host.LogicalDriveStrings(chars, to.Chars(chars)) != 0, 0};
    });
    return written;
  }
  std::uint32_t DriveType(const char16_t* path) noexcept override {
    const std::uint32_t type = base->DriveType(path);
    Add({}, [path = TextOf(path), type](auto& host, auto&) {
      return Status{host.DriveType(path.c_str()) == type, 0};
    });
    return type;
  }
  Status VolumeInformation(const char16_t* path, char16_t* label, std::uint32_t labelChars,
                           std::uint32_t& serial, std::uint32_t& flags, char16_t* system,
                           std::uint32_t systemChars) noexcept override {
    return Add(base->VolumeInformation(path, label, labelChars, serial, flags, system, systemChars),
               [path = TextOf(path), hasLabel = label != nullptr, labelChars,
                hasSystem = system != nullptr, systemChars](auto& host, auto& to) {
                 char16_t* texts = to.Chars(labelChars + systemChars);
                 return host.VolumeInformation(
                     path.c_str(), hasLabel ? texts : nullptr, labelChars, to.number,
                     to.otherNumber, hasSystem ? texts + labelChars : nullptr, systemChars);
               });
  }
  Status FirstMountPoint(const char16_t* volume, char16_t* folder, std::uint32_t chars,
                         FindHandle& search) noexcept override {
    return AddOpening(base->FirstMountPoint(volume, folder, chars, search), search,
                      [volume = TextOf(volume), chars](auto& host, auto& to, auto& given) {
                        return host.FirstMountPoint(volume.c_str(), to.Chars(chars), chars, given);
                      });
  }
  Status NextMountPoint(FindHandle search, char16_t* folder,
                        std::uint32_t chars) noexcept override {
    return Add(base->NextMountPoint(search, folder, chars),
               [slot = SlotOf(search), chars](auto& host, auto& to) {
                 return host.NextMountPoint(Of(slot, to), to.Chars(chars), chars);
               });
  }
  Status CloseMountPointSearch(FindHandle search) noexcept override {
    return Add(base->CloseMountPointSearch(search), [slot = SlotOf(search)](auto& host, auto& to) {
      return host.CloseMountPointSearch(Of(slot, to));
    });
  }
  Status DosDeviceTarget(const char16_t* name, char16_t* target,
                         std::uint32_t chars) noexcept override {
    return Add(base->DosDeviceTarget(name, target, chars),
               [name = TextOf(name), chars](auto& host, auto& to) {
                 return host.DosDeviceTarget(name.c_str(), to.Chars(chars), chars);
               });
  }
  void WriteDebugText(const char16_t* text) noexcept override { base->WriteDebugText(text); }

 private:
  using Slot = std::size_t;
  struct Call {
    bool succeeded;
    std::function<bool(platform::Host&, Replaying&)> repeat;
  };

  static std::intptr_t Of(Slot slot, const Replaying& to) { return to.handles[slot]; }
  // A handle from before the recording stands for itself in no repetition: it gets a slot that
  // nothing fills, and its calls end otherwise.
  Slot SlotOf(std::intptr_t handle) {
    const auto [place, fresh] = m_slots.try_emplace(handle, m_slotCount);
    if (fresh) ++m_slotCount;
    return place->second;
  }

  template <class Repeat>
  Status Add(const Status& status, Repeat repeat) {
    m_calls.push_back(
        {status.ok, [repeat = std::move(repeat)](platform::Host& host, Replaying& to) {
           return repeat(host, to).ok;
         }});
    return status;
  }
  // `opened` is read when the call has been made.
  template <class Repeat>
  Status AddOpening(const Status& status, const std::intptr_t& opened, Repeat repeat) {
    const Slot slot = SlotOf(opened);
    return Add(status, [slot, repeat = std::move(repeat)](platform::Host& host, Replaying& to) {
      return repeat(host, to, to.handles[slot]);
    });
  }

  std::vector<Call> m_calls;
  std::unordered_map<std::intptr_t, Slot> m_slots;
  Slot m_slotCount = 0;
};

Recording::Recording() : m_recorder(std::make_unique<Recorder>()) {}
Recording::~Recording() = default;

platform::Host& Recording::Host(platform::Host& base) {
  m_recorder->base = &base;
  return *m_recorder;
}

void Recording::Clear() { m_recorder->Clear(); }
std::size_t Recording::Calls() const noexcept { return m_recorder->Calls(); }
std::size_t Recording::Replay(platform::Host& host) const { return m_recorder->Replay(host); }

}  // namespace bench
