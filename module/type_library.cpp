#include "module/type_library.h"

#include "com/zkusb_monitor.h"

namespace KelvoUHW {
namespace {

using platform::FromSystemGuid;
using platform::LibraryInterface;

template <class Interface>
LibraryInterface Automation(const char16_t* name) {
  return {FromSystemGuid(platform::IidOf<Interface>()), name, false};
}

}  // namespace

platform::TypeLibrary ModuleTypeLibrary() {
  platform::TypeLibrary library;
  library.attributes.guid = FromSystemGuid(LIBID_ZKUsbMonitorLib);
#ifdef _WIN64
  library.attributes.syskind = platform::kSYS_WIN64;
#else
  // Elsewhere than on Windows, too: what is modelled there is the 32-bit module.
  library.attributes.syskind = platform::kSYS_WIN32;
#endif
  library.attributes.wMajorVerNum = 1;
  library.helpString = u"ZKUsbMonitor 1.0 Type Library";
  library.interfaces = {
      Automation<IZKUMEventNotifier>(u"IZKUMEventNotifier"),
      Automation<IZKUMDeviceEvent>(u"IZKUMDeviceEvent"),
      Automation<IZKUMUsbTreeNode>(u"IZKUMUsbTreeNode"),
      Automation<IZKUMUsbTreeNodeEnumerator>(u"IZKUMUsbTreeNodeEnumerator"),
      Automation<IZKUMUsbDevice>(u"IZKUMUsbDevice"),
      Automation<IZKUMHostController>(u"IZKUMHostController"),
      Automation<IZKUMHubDevice>(u"IZKUMHubDevice"),
      Automation<IZKUMHubPort>(u"IZKUMHubPort"),
      Automation<IZKUMPortDevice>(u"IZKUMPortDevice"),
      Automation<IZKUMInterfaceDescr>(u"IZKUMInterfaceDescr"),
      Automation<IZKUMInfoDevice>(u"IZKUMInfoDevice"),
      Automation<IZKUMInterfaceDevice>(u"IZKUMInterfaceDevice"),
      Automation<IZKUMUsbTree>(u"IZKUMUsbTree"),
      {FromSystemGuid(DIID_IZKDeviceEventCallBack), u"IZKDeviceEventCallBack", true},
  };
  return library;
}

}  // namespace KelvoUHW
