#include "module/server_description.h"

#include <array>

#include "com/zkusb_monitor.h"
#include "module/scripts.h"

namespace KelvoUHW {

namespace {

using platform::FromSystemGuid;

// Made when the module is loaded. Variables of a function would be guarded by the run-time library
// of Windows builds, which takes a system index for that and does not give it back when the module
// is unloaded.
//
// The tree is registered as "ZKUMUsbTree Class" although the type library calls the same class "USB
// Tree". Both are published and deliberate.
const std::array kClasses = {
    RegisteredClass{FromSystemGuid(CLSID_ZKUMUsbTree), RegistryScript(ScriptResource::UsbTree),
                    u"KelvoUsbMonitor.UsbTree", u"1", u"ZKUMUsbTree Class", u"Free"},
    RegisteredClass{FromSystemGuid(CLSID_ZKUMEventNotifier),
                    RegistryScript(ScriptResource::EventNotifier), u"KelvoUsbMonitor.EventNotifier",
                    u"1", u"ZKUMEventNotifier Class", u"Free"},
};
const ServerDescription kDescription{FromSystemGuid(LIBID_ZKUsbMonitorLib),
                                     RegistryScript(ScriptResource::Module), kClasses};

}  // namespace

const ServerDescription& ModuleDescription() noexcept { return kDescription; }

}  // namespace KelvoUHW
