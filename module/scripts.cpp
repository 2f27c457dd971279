#include "module/scripts.h"

namespace KelvoUHW {
namespace {

constexpr unsigned char kModule[] = {
#include "module_script.inc"
};
constexpr unsigned char kEventNotifier[] = {
#include "event_notifier_script.inc"
};
constexpr unsigned char kUsbTree[] = {
#include "usb_tree_script.inc"
};

template <std::size_t Bytes>
std::string_view Text(const unsigned char (&bytes)[Bytes]) noexcept {
  return {reinterpret_cast<const char*>(bytes), Bytes};
}

}  // namespace

std::string_view RegistryScript(ScriptResource resource) noexcept {
  switch (resource) {
    case ScriptResource::Module:
      return Text(kModule);
    case ScriptResource::EventNotifier:
      return Text(kEventNotifier);
    case ScriptResource::UsbTree:
      return Text(kUsbTree);
  }
  return {};
}

}  // namespace KelvoUHW
