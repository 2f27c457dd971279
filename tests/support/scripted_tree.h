// A tree object whose builds, codes and lists a test sets; it is its own class object.
#pragma once

#include <array>
#include <functional>

#include "com/private_interfaces.h"
#include "tests/support/com_objects.h"

namespace KelvoUHW {

class ScriptedTree final : public IZKUMUsbTree, public IBuildUsbTree, public IClassFactory {
 public:
  ~ScriptedTree() { EXPECT_EQ(m_references, 1) << "references of others"; }

  HRESULT created = S_OK;  // by the class
  HRESULT offers = S_OK;   // when asked for what builds
  HRESULT built = S_OK;
  HRESULT listed = S_OK;
  HRESULT reset = S_OK;
  bool withoutLists = false;
  std::array<DeviceList, 4> lists;
  std::function<void()> onBuild;
  std::string calls;  // "build list1 reset"
  int creations = 0;
  IID alias{};  // answered for, too

  // A device with this id below a new hub port.
  NodePtr Device(const std::u16string& id) {
    return Below(m_ports.emplace_back(MakeNode<CZKUMHubPortImpl>(u"", {}, 1u)), id);
  }
  // The same below any other record, which the caller owns; nowhere for an empty one.
  static NodePtr Below(const NodePtr& parent, const std::u16string& id) {
    NodePtr device = MakeNode<CZKUMPortDeviceImpl>(id, {}, 0u, nullptr, nullptr, nullptr, u"", u"", u"");
    if (parent) AddChild(device, parent.Get());
    return device;
  }

  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID iid, void** out) override {
    *out = nullptr;
    if (iid == platform::IidOf<IBuildUsbTree>()) {
      if (FAILED(offers)) return offers;
      *out = static_cast<IBuildUsbTree*>(this);
    } else if (iid == platform::IidOf<IClassFactory>()) {
      *out = static_cast<IClassFactory*>(this);
    } else if (iid == platform::IidOf<IUnknown>() || iid == platform::IidOf<IZKUMUsbTree>() || iid == alias) {
      *out = static_cast<IZKUMUsbTree*>(this);
    } else {
      return E_NOINTERFACE;
    }
    AddRef();
    return S_OK;
  }
  ULONG STDMETHODCALLTYPE AddRef() override { return static_cast<ULONG>(++m_references); }
  ULONG STDMETHODCALLTYPE Release() override { return static_cast<ULONG>(--m_references); }

  HRESULT STDMETHODCALLTYPE CreateInstance(IUnknown* outer, REFIID iid, void** out) override {
    EXPECT_EQ(outer, nullptr);
    ++creations;
    if (FAILED(created)) return created;
    return QueryInterface(iid, out);
  }
  HRESULT STDMETHODCALLTYPE LockServer(BOOL) override { return S_OK; }

  HRESULT STDMETHODCALLTYPE get_RootNode(IZKUMUsbTreeNode**) override { return E_NOTIMPL; }
  HRESULT STDMETHODCALLTYPE get_PortDevicesWithVendorId(ULONG, IZKUMUsbTreeNodeEnumerator**) override {
    return E_NOTIMPL;
  }
  HRESULT STDMETHODCALLTYPE get_VendorProductDevices(ULONG, ULONG, IZKUMUsbTreeNodeEnumerator**) override {
    return E_NOTIMPL;
  }
  HRESULT STDMETHODCALLTYPE get_PortDevicesWithVolume(IZKUMUsbTreeNodeEnumerator**) override { return E_NOTIMPL; }

  HRESULT STDMETHODCALLTYPE BuildTree() override {
    Called("build");
    if (onBuild) onBuild();
    return built;
  }
  HRESULT STDMETHODCALLTYPE ResetDeviceCache() override {
    Called("reset");
    return reset;
  }
  HRESULT STDMETHODCALLTYPE GetDeviceList(LONG nList, const DeviceList** ppList) override {
    Called("list" + std::to_string(nList));
    *ppList = withoutLists ? nullptr : &lists.at(static_cast<std::size_t>(nList));
    return listed;
  }

 private:
  void Called(const std::string& call) { calls += (calls.empty() ? "" : " ") + call; }

  std::int32_t m_references = 1;
  std::vector<NodePtr> m_ports;
};

}  // namespace KelvoUHW
