#include "module/server_description.h"

#include <array>

#include "com/zkusb_monitor.h"
#include "module/scripts.h"

namespace KelvoUHW {

const ServerDescription& ModuleDescription() noexcept {
  using platform::FromSystemGuid;
  // The tree is registered as "ZKUMUsbTree Class" although the type library calls the same class
  // "USB Tree". Both are published and meant.
  static const std::array kClasses = {
      RegisteredClass{FromSystemGuid(CLSID_ZKUMUsbTree), RegistryScript(ScriptResource::UsbTree),
                      u"KelvoUsbMonitor.UsbTree", u"1", u"ZKUMUsbTree Class", u"Free"},
      RegisteredClass{FromSystemGuid(CLSID_ZKUMEventNotifier),
                      RegistryScript(ScriptResource::EventNotifier),
                      u"KelvoUsbMonitor.EventNotifier", u"1", u"ZKUMEventNotifier Class", u"Free"},
  };
  static const ServerDescription kDescription{FromSystemGuid(LIBID_ZKUsbMonitorLib),
                                              RegistryScript(ScriptResource::Module), kClasses};
  return kDescription;
}

}  // namespace KelvoUHW
