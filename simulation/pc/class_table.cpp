#include "simulation/pc/class_table.h"

#include <array>
#include <cstdint>

#include "platform/setup_api.h"

namespace platform::simulated {
namespace {

// Most classes of the system share all but the first number of their GUIDs.
constexpr Guid SystemClass(std::uint32_t number) {
  return {number, 0xE325, 0x11CE, {0xBF, 0xC1, 0x08, 0x00, 0x2B, 0xE1, 0x03, 0x18}};
}

struct Description {
  Guid classGuid;
  std::u16string_view text;
};

constexpr std::array kDescriptions = {
    Description{GUID_DEVCLASS_USB, u"Universal Serial Bus controllers"},
    Description{GUID_DEVCLASS_VOLUME, u"Storage volumes"},
    Description{GUID_DEVCLASS_IMAGE, u"Imaging devices"},
    Description{GUID_DEVCLASS_WCEUSBS, u"Mobile devices"},
    Description{SystemClass(0x4D36E965), u"DVD/CD-ROM drives"},
    Description{SystemClass(0x4D36E966), u"Computer"},
    Description{GUID_DEVCLASS_DISKDRIVE, u"Disk drives"},
    Description{SystemClass(0x4D36E968), u"Display adapters"},
    Description{SystemClass(0x4D36E96A), u"IDE ATA/ATAPI controllers"},
    Description{SystemClass(0x4D36E96B), u"Keyboards"},
    Description{SystemClass(0x4D36E96C), u"Sound, video and game controllers"},
    Description{SystemClass(0x4D36E96D), u"Modems"},
    Description{SystemClass(0x4D36E96E), u"Monitors"},
    Description{SystemClass(0x4D36E96F), u"Mice and other pointing devices"},
    Description{SystemClass(0x4D36E972), u"Network adapters"},
    Description{SystemClass(0x4D36E978), u"Ports (COM & LPT)"},
    Description{SystemClass(0x4D36E97B), u"Storage controllers"},
    Description{SystemClass(0x4D36E97D), u"System devices"},
    Description{GUID_DEVCLASS_UNKNOWN, u"Other devices"},
    Description{{0x50127DC3, 0x0F36, 0x415E, {0xA6, 0xCC, 0x4C, 0xB3, 0xBE, 0x91, 0x0B, 0x65}},
                u"Processors"},
    Description{{0x745A17A0, 0x74D3, 0x11D0, {0xB6, 0xFE, 0x00, 0xA0, 0xC9, 0x0F, 0x57, 0xDA}},
                u"Human Interface Devices"},
    Description{{0xE0CBF06C, 0xCD8B, 0x4647, {0xBB, 0x8A, 0x26, 0x3B, 0x43, 0xF0, 0xF9, 0x74}},
                u"Bluetooth"},
    Description{{0xCA3E7AB9, 0xB4C3, 0x4AE6, {0x82, 0x51, 0x57, 0x9E, 0xF9, 0x33, 0x89, 0x0F}},
                u"Cameras"},
    Description{{0xEEC5AD98, 0x8080, 0x425F, {0x92, 0x2A, 0xDA, 0xBF, 0x3D, 0xE3, 0xF6, 0x9A}},
                u"Portable Devices"},
};

}  // namespace

std::u16string_view WellKnownClassDescription(const Guid& classGuid) {
  for (const Description& entry : kDescriptions) {
    if (entry.classGuid == classGuid) return entry.text;
  }
  return {};
}

}  // namespace platform::simulated
