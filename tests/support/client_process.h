// A client's process on a simulated PC, which knows the module over COM alone.
#pragma once

#include <gtest/gtest.h>

#include "bench/plugs.h"
#include "com/com_ptr.h"
#include "com/zkusb_monitor.h"
#include "module/type_library.h"
#include "platform/server_module.h"
#include "platform/system.h"
#include "simulation/desktop/simulated_desktop.h"
#include "simulation/pc/simulated_pc.h"
#include "simulation/process/module_environment.h"
#include "simulation/process/registry.h"
#include "simulation/process/type_libraries.h"

namespace KelvoUHW {

using platform::simulated::ClockMode;

// What a test holds of the module it gives back before the end.
struct ClientProcess {
  explicit ClientProcess(const std::vector<Change>& devices, std::u16string file = platform::ServerModulePath(),
                         ClockMode mode = ClockMode::Virtual)
      : module(std::move(file)), desktop(mode) {
    for (const Change& change : devices) EXPECT_EQ(pc.Apply({0, u"", change}), u"");
    typeLibraries.Add(module, ModuleTypeLibrary());
    platform::SetCurrentSystem({&pc, &desktop, &desktop, &registry, &typeLibraries, &environment});
  }
  ~ClientProcess() {
    desktop.EndProcess();
    EXPECT_TRUE(desktop.Misuses().empty());
    EXPECT_TRUE(pc.Misuses().empty());
    platform::SetCurrentSystem({});
  }

  HRESULT Register() { return platform::RegisterServerModule(module); }
  template <class Interface>
  static ComPtr<Interface> Create(const CLSID& clsid, HRESULT expected = S_OK) {
    ComPtr<Interface> object;
    EXPECT_EQ(CoCreateInstance(clsid, nullptr, CLSCTX_INPROC_SERVER, platform::IidOf<Interface>(), object.PutVoid()),
              expected);
    return object;
  }
  static HRESULT RootOf(const ComPtr<IZKUMUsbTree>& tree) {
    ComPtr<IZKUMUsbTreeNode> root;
    const HRESULT result = tree->get_RootNode(root.Put());
    EXPECT_EQ(static_cast<bool>(root), result == S_OK);
    return result;
  }

  const std::u16string module;
  platform::simulated::SimulatedPc pc{BarePc()};
  platform::simulated::SimulatedDesktop desktop;
  platform::simulated::SimulatedRegistry registry;
  platform::simulated::SimulatedTypeLibraries typeLibraries{registry};
  platform::simulated::SimulatedModuleEnvironment environment{module};
};

}  // namespace KelvoUHW
