// Prints each USB stick with its drive letter, then what comes and goes, until Ctrl-C or for as many seconds as are
// given.
#include <cstdio>
#include <cstdlib>

#include "zkusb_monitor_watcher.h"

void Print(const char* what, const zkum::Device& device) {
  if (!device.storage) return;
  std::printf("%s: %s %s (%s), serial %s, port %s\n", what, zkum::Utf8(device.vendor).c_str(),
              zkum::Utf8(device.product).c_str(), zkum::Utf8(device.Letters()).c_str(),
              zkum::Utf8(device.serial).c_str(), zkum::Utf8(device.portPath).c_str());
  std::fflush(stdout);
}

int main(int argc, char** argv) {
  zkum::Watcher watcher([](const zkum::Event& event) {
    if (event.kind == KDeviceAttached || event.kind == KDeviceRemoved) Print(zkum::EventName(event.kind), event.device);
  });
  if (FAILED(watcher.Error())) return std::fprintf(stderr, "no events: 0x%08lX\n", watcher.Error()), 1;
  for (const zkum::Device& device : watcher.Devices()) Print("there", device);
  Sleep(argc > 1 ? 1000 * std::strtoul(argv[1], nullptr, 10) : INFINITE);
}
