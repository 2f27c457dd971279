// The DLLs under test, which lie one folder above the tests.
#pragma once

#include <string>

#include "platform/server_module.h"

inline std::u16string ModuleFile(const char16_t* name) {
  std::u16string path = platform::ServerModulePath();
  for (int level = 0; level < 2; ++level) path.resize(path.find_last_of(u"\\/"));
  return path.append(u"\\").append(name);
}

inline std::u16string Module() { return ModuleFile(u"ZKUsbMonitor.dll"); }
inline std::u16string SimulatedModule() { return ModuleFile(u"ZKUsbMonitorSimulated.dll"); }
