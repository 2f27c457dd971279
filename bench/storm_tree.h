// What stands between the notifier and the PC in the storm: a host that lets others run where a
// build holds no lock, and a tree object that writes down what each build found.
#pragma once

#include <functional>
#include <set>
#include <string>
#include <vector>

#include "bench/storm_pc.h"
#include "com/com_ptr.h"
#include "com/private_interfaces.h"
#include "com/zkusb_monitor.h"
#include "platform/wrappers/intercepting_host.h"

namespace bench {

// Remembers the device-information sets that a build leaves open, and closes them afterwards: a
// storm of a million builds would fill the simulated PC with them.
class StormHost final : public platform::wrappers::InterceptingHost {
 public:
  StormHost(platform::Host& base, std::function<void()> pause)
      : InterceptingHost(base), m_base(base), m_pause(std::move(pause)) {}

  // How many sets were left open since the last call. By the thread that has built.
  std::size_t CloseLeftOpen();

 protected:
  platform::Status BeforeCall(const platform::wrappers::HostCall& call) noexcept override;
  void AfterCall(const platform::wrappers::HostCall& call, const platform::Status& status,
                 const std::intptr_t* opened) noexcept override;

 private:
  platform::Host& m_base;
  const std::function<void()> m_pause;
  std::set<std::intptr_t> m_open;  // builds come one after the other
};

// What a build that found a change put into its lists, devices on hub ports only, by serial number.
struct Found {
  std::vector<std::string> attached, connected, removed, modified;
  Names during, since;  // see Disturbances
  bool inAdvise = false;
};

// Passes everything on to the component's own tree. Lives as long as the notifier, whatever its
// references; its builds are serialised by the notification lock.
class StormTree final : public IZKUMUsbTree, public IBuildUsbTree, public IClassFactory {
 public:
  StormTree(KelvoUHW::ComPtr<IZKUMUsbTree> tree, StormPc& pc, StormHost& host)
      : m_tree(std::move(tree)), m_build(m_tree.As<IBuildUsbTree>()), m_pc(pc), m_host(host) {}

  // Called for each build, with the notification lock held; one that found no change has only what
  // was touched while it ran.
  std::function<void(const Found&)> onChange;
  std::function<void(const Names& during)> onNoChange;
  std::size_t builds = 0, changes = 0, hubs = 0;  // hubs: one for each build and external hub
  std::size_t fewestSets = ~std::size_t{0}, mostSets = 0;
  // Set around a call of Advise: its build is its own, and tells others nothing.
  static inline thread_local bool t_advises = false;

  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID iid, void** out) override;
  ULONG STDMETHODCALLTYPE AddRef() override { return 2; }
  ULONG STDMETHODCALLTYPE Release() override { return 1; }
  HRESULT STDMETHODCALLTYPE CreateInstance(IUnknown*, REFIID iid, void** out) override {
    return QueryInterface(iid, out);
  }
  HRESULT STDMETHODCALLTYPE LockServer(BOOL) override { return S_OK; }
  HRESULT STDMETHODCALLTYPE get_RootNode(IZKUMUsbTreeNode** out) override {
    return m_tree->get_RootNode(out);
  }
  HRESULT STDMETHODCALLTYPE get_PortDevicesWithVendorId(ULONG vendor,
                                                        IZKUMUsbTreeNodeEnumerator** out) override {
    return m_tree->get_PortDevicesWithVendorId(vendor, out);
  }
  HRESULT STDMETHODCALLTYPE get_VendorProductDevices(ULONG vendor, ULONG product,
                                                     IZKUMUsbTreeNodeEnumerator** out) override {
    return m_tree->get_VendorProductDevices(vendor, product, out);
  }
  HRESULT STDMETHODCALLTYPE get_PortDevicesWithVolume(IZKUMUsbTreeNodeEnumerator** out) override {
    return m_tree->get_PortDevicesWithVolume(out);
  }
  HRESULT STDMETHODCALLTYPE BuildTree() override;
  HRESULT STDMETHODCALLTYPE ResetDeviceCache() override { return m_build->ResetDeviceCache(); }
  HRESULT STDMETHODCALLTYPE GetDeviceList(LONG number, const KelvoUHW::DeviceList** out) override {
    return m_build->GetDeviceList(number, out);
  }

 private:
  std::vector<std::string> NamesIn(LONG list) const;

  const KelvoUHW::ComPtr<IZKUMUsbTree> m_tree;
  const KelvoUHW::ComPtr<IBuildUsbTree> m_build;
  StormPc& m_pc;
  StormHost& m_host;
};

}  // namespace bench
