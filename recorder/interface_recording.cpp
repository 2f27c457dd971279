// Device interfaces of the classes that the component asks for, and of those whose messages it
// hears.
#include <array>
#include <cstring>

#include "platform/setup_api.h"
#include "recorder/recording.h"
#include "records/device_set.h"

namespace recorder {
namespace {

using platform::Guid;

// Public source: the interface-class headers of the driver kits.
constexpr std::array kInterfaceClasses = {
    platform::kNullGuid,
    platform::GUID_DEVINTERFACE_VOLUME,
    platform::GUID_DEVINTERFACE_DISK,
    platform::GUID_DEVINTERFACE_FLOPPY,
    platform::GUID_DEVINTERFACE_CDROM,
    // USB: host controllers, hubs, devices
    Guid{0x3ABF6F2D, 0x71C4, 0x462A, {0x8A, 0x92, 0x1E, 0x68, 0x61, 0xE6, 0xAF, 0x27}},
    Guid{0xF18A0E88, 0xC30C, 0x11D0, {0x88, 0x15, 0x00, 0xA0, 0xC9, 0x06, 0xBE, 0xD8}},
    Guid{0xA5DCBF10, 0x6530, 0x11D2, {0x90, 0x1F, 0x00, 0xC0, 0x4F, 0xB9, 0x51, 0xED}},
    // HID, keyboards, mice
    Guid{0x4D1E55B2, 0xF16F, 0x11CF, {0x88, 0xCB, 0x00, 0x11, 0x11, 0x00, 0x00, 0x30}},
    Guid{0x884B96C3, 0x56EF, 0x11D1, {0xBC, 0x8C, 0x00, 0xA0, 0xC9, 0x14, 0x05, 0xDD}},
    Guid{0x378DE44C, 0x56EF, 0x11D1, {0xBC, 0x8C, 0x00, 0xA0, 0xC9, 0x14, 0x05, 0xDD}},
    // portable devices, cameras
    Guid{0x6AC27878, 0xA6FA, 0x4155, {0xBA, 0x85, 0xF9, 0x8F, 0x49, 0x1D, 0x4F, 0x33}},
    Guid{0x6BDD1FC6, 0x810F, 0x11D0, {0xBE, 0xC7, 0x08, 0x00, 0x2B, 0xE2, 0x09, 0x2F}},
    // partitions, hidden volumes
    Guid{0x53F5630A, 0xB6BF, 0x11D0, {0x94, 0xF2, 0x00, 0xA0, 0xC9, 0x1E, 0xFB, 0x8B}},
    Guid{0x7F108A28, 0x9833, 0x4B3B, {0xB7, 0x80, 0x2C, 0x6B, 0x5F, 0xA5, 0xC0, 0x62}},
    // serial ports, modems, printers, smart cards, radios
    Guid{0x86E0D1E0, 0x8089, 0x11D0, {0x9C, 0xE4, 0x08, 0x00, 0x3E, 0x30, 0x1F, 0x73}},
    Guid{0x2C7089AA, 0x2E0E, 0x11D1, {0xB1, 0x14, 0x00, 0xC0, 0x4F, 0xC2, 0xAA, 0xE4}},
    Guid{0x28D78FAD, 0x5A12, 0x11D1, {0xAE, 0x5B, 0x00, 0x00, 0xF8, 0x03, 0xA8, 0xC2}},
    Guid{0x50DD5230, 0xBA8A, 0x11D1, {0xBF, 0x5D, 0x00, 0x00, 0xF8, 0x05, 0xF5, 0x30}},
    Guid{0x0850302A, 0xB344, 0x4FDA, {0x9B, 0xE9, 0x90, 0x57, 0x6B, 0x8D, 0x46, 0xF0}},
};

class InterfaceRecorder {
 public:
  explicit InterfaceRecorder(Recording& recording)
      : m_recording(recording), m_host(recording.host) {}

  void Run() {
    for (const Guid& interfaceClass : kInterfaceClasses) RecordClass(interfaceClass);
  }

 private:
  void RecordClass(const Guid& interfaceClass) {
    KelvoUHW::DeviceSet set(m_host);
    if (!set.Open(&interfaceClass, platform::kDIGCF_PRESENT | platform::kDIGCF_DEVICEINTERFACE)) {
      return;
    }
    for (std::uint32_t index = 0; index < kMostElements; ++index) {
      platform::SP_DEVICE_INTERFACE_DATA data{.cbSize = sizeof data};
      if (!m_host.EnumDeviceInterfaces(set.Get(), interfaceClass, index, data)) return;
      // As for the component, an interface without detail ends the class.
      if (!RecordElement(set.Get(), interfaceClass, data)) return;
    }
  }

  bool RecordElement(platform::DeviceSetHandle set, const Guid& interfaceClass,
                     const platform::SP_DEVICE_INTERFACE_DATA& data) {
    std::uint32_t required = 0;
    m_host.GetDeviceInterfaceDetail(set, data, nullptr, 0, &required, nullptr);
    if (required <= platform::kInterfaceDetailPathOffset || required > kMostBytes) return false;
    std::vector<char16_t> detail(required / sizeof(char16_t) + 1);
    const std::uint32_t fixedPart = platform::kInterfaceDetailSize;
    std::memcpy(detail.data(), &fixedPart, sizeof fixedPart);
    platform::SP_DEVINFO_DATA device{.cbSize = sizeof device};
    if (!m_host.GetDeviceInterfaceDetail(set, data, detail.data(), required, nullptr, &device)) {
      return false;
    }
    constexpr std::size_t kPathAt = platform::kInterfaceDetailPathOffset / sizeof(char16_t);
    Text path(platform::UpToZero({detail.data() + kPathAt, detail.size() - kPathAt}));
    const auto owner = m_recording.positions.find(device.DevInst);
    if (path.empty() || owner == m_recording.positions.end()) {
      m_recording.Note(u"A device interface without path or device is left out.");
    } else if (m_paths.Add(path)) {
      m_recording.machine.interfaces.push_back(
          {interfaceClass, std::move(path), m_recording.machine.devices[owner->second].id});
    }
    return true;
  }

  Recording& m_recording;
  platform::Host& m_host;
  platform::simulated::NameSet m_paths;
};

}  // namespace

void RecordInterfaces(Recording& recording) { InterfaceRecorder(recording).Run(); }

}  // namespace recorder
