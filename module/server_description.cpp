#include "module/server_description.h"

#include <array>

#include "module/scripts.h"

namespace KelvoUHW {
namespace {

constexpr platform::Guid kAppId{
    0xA0C53575, 0x7F3D, 0x4FF2, {0xB5, 0xA7, 0xBF, 0xA8, 0x73, 0x49, 0x25, 0x10}};
constexpr platform::Guid kLibId{
    0xA2AC77FD, 0x36C6, 0x4C2A, {0xB2, 0x38, 0xF8, 0x9B, 0x35, 0xDA, 0xA5, 0x70}};
constexpr platform::Guid kUsbTree{
    0x34349D2D, 0x14C6, 0x414B, {0x97, 0x71, 0xA7, 0xBD, 0x2A, 0x7C, 0x71, 0x80}};
constexpr platform::Guid kEventNotifier{
    0x1D7E7A5B, 0x648D, 0x4236, {0x86, 0x04, 0x8F, 0x5F, 0x3C, 0x82, 0x43, 0x3A}};

}  // namespace

const ServerDescription& ModuleDescription() noexcept {
  // The tree is registered as "ZKUMUsbTree Class" although the type library calls the same class
  // "USB Tree". Both are published and meant.
  static const std::array kClasses = {
      RegisteredClass{kUsbTree, RegistryScript(ScriptResource::UsbTree), u"KelvoUsbMonitor.UsbTree",
                      u"1", u"ZKUMUsbTree Class", u"Free"},
      RegisteredClass{kEventNotifier, RegistryScript(ScriptResource::EventNotifier),
                      u"KelvoUsbMonitor.EventNotifier", u"1", u"ZKUMEventNotifier Class", u"Free"},
  };
  static const ServerDescription kDescription{kAppId, kLibId,
                                              RegistryScript(ScriptResource::Module), kClasses};
  return kDescription;
}

}  // namespace KelvoUHW
