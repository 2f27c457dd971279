// A module over this process's PC, loaded and unloaded as often as a test likes.
#pragma once

#include <windows.h>

#include "bench/object_reader.h"
#include "com/private_interfaces.h"
#include "com/zkusb_monitor.h"
#include "platform/text.h"
#include "simulation/abi/abi_pc.h"
#include "tests/windows/module_files.h"

namespace abi_pc {

using KelvoUHW::ComPtr;

class LoadedModule {
 public:
  // The module that ships has the PC put before it; the simulated one reads its own from ZKUSB_MACHINE.
  explicit LoadedModule(const std::u16string& path = Module()) : m_path(path) {
    m_module = LoadLibraryW(platform::ToSystemText(path.c_str()));
    if (m_module == nullptr) return;
    if (path == Module()) Attach(m_module);
    ComPtr<IClassFactory> factory;
    if (FAILED(Export<HRESULT(STDAPICALLTYPE*)(REFCLSID, REFIID, void**)>("DllGetClassObject")(
            CLSID_ZKUMUsbTree, platform::IidOf<IClassFactory>(), factory.PutVoid()))) {
      return;
    }
    factory->CreateInstance(nullptr, platform::IidOf<IZKUMUsbTree>(), tree.PutVoid());
    build = tree.As<IBuildUsbTree>();
  }
  ~LoadedModule() {
    tree.Reset();
    build.Reset();
    if (m_module != nullptr) FreeLibrary(m_module);
  }
  LoadedModule(const LoadedModule&) = delete;
  LoadedModule& operator=(const LoadedModule&) = delete;

  template <class Function>
  Function Export(const char* name) const {
    return reinterpret_cast<Function>(reinterpret_cast<void*>(GetProcAddress(m_module, name)));
  }
  HMODULE Handle() const { return m_module; }

  // As an event does it.
  HRESULT Build() const {
    const HRESULT result = build->BuildTree();
    build->ResetDeviceCache();
    return result;
  }

  // The dump, and every property of every node; empty where there is no root.
  std::string Picture() const {
    ComPtr<IZKUMUsbTreeNode> root;
    if (FAILED(tree->get_RootNode(root.Put()))) return {};
    std::string text = platform::ToUtf8(testing_support::DumpOf(root));
    testing_support::WalkChilds(root, [&](const ComPtr<IZKUMUsbTreeNode>& node) {
      testing_support::ReadProperties(node, [&](const char* name, HRESULT result, const auto& value) {
        text.append(name).append(" ").append(std::to_string(result)).append(" ");
        if constexpr (requires { std::to_string(value); }) {
          text.append(std::to_string(value));
        } else {
          text.append(platform::ToUtf8(value));
        }
        text += '\n';
      });
    });
    return text;
  }

  ComPtr<IZKUMUsbTree> tree;
  ComPtr<IBuildUsbTree> build;

 private:
  const std::u16string m_path;
  HMODULE m_module = nullptr;
};

}  // namespace abi_pc
