#include "bench/storm_tree.h"

#include <algorithm>
#include <utility>

#include "records/node.h"
#include "records/record_lock.h"

namespace bench {

using platform::wrappers::HostCall, platform::wrappers::Operation;

platform::Status StormHost::BeforeCall(const HostCall& call) noexcept {
  switch (call.operation) {
    case Operation::OpenDevice:
    case Operation::GetClassDevs:
    case Operation::GetClassImageList:
    case Operation::FirstVolume:
      m_pause();
      break;
    default:
      break;
  }
  return platform::Status::Success();
}

void StormHost::AfterCall(const HostCall& call, const platform::Status&,
                          const std::intptr_t* opened) noexcept {
  if (call.operation == Operation::GetClassDevs && opened != nullptr) m_open.insert(*opened);
  if (call.operation == Operation::DestroyDeviceInfoList) m_open.erase(call.handle);
}

std::size_t StormHost::CloseLeftOpen() {
  const std::set<std::intptr_t> left = std::exchange(m_open, {});
  for (const std::intptr_t set : left) m_base.DestroyDeviceInfoList(set);
  return left.size();
}

HRESULT StormTree::QueryInterface(REFIID iid, void** out) {
  if (iid == platform::IidOf<IBuildUsbTree>()) {
    *out = static_cast<IBuildUsbTree*>(this);
  } else if (iid == platform::IidOf<IClassFactory>()) {
    *out = static_cast<IClassFactory*>(this);
  } else {
    *out = static_cast<IZKUMUsbTree*>(this);
  }
  return S_OK;
}

HRESULT StormTree::BuildTree() {
  m_pc.disturbances.BuildBegins();
  hubs += m_pc.Hubs();
  const HRESULT result = m_build->BuildTree();
  Found found;
  m_pc.disturbances.BuildEnds(result == S_OK, found.during, found.since);
  ++builds;
  const std::size_t sets = m_host.CloseLeftOpen();
  fewestSets = std::min(fewestSets, sets);
  mostSets = std::max(mostSets, sets);
  if (result != S_OK) {
    onNoChange(found.during);
    return result;
  }
  ++changes;
  found.connected = NamesIn(KDeviceConnected);
  found.attached = NamesIn(KDeviceAttached);
  found.removed = NamesIn(KDeviceRemoved);
  found.modified = NamesIn(KDeviceModified);
  found.inAdvise = t_advises;
  onChange(found);
  return result;
}

std::vector<std::string> StormTree::NamesIn(LONG list) const {
  const KelvoUHW::DeviceList* devices = nullptr;
  m_build->GetDeviceList(list, &devices);
  std::vector<std::string> names;
  const KelvoUHW::RecordReadLock lock;
  for (const KelvoUHW::NodePtr& device : *devices) {
    const KelvoUHW::CZKUMUsbTreeNodeImpl* parent = device->m_pParent;
    if (parent == nullptr || parent->m_nType != KUDTHubPort) continue;
    const std::u16string& id = device->m_strDevInstId;
    names.push_back(platform::ToUtf8(id.substr(id.rfind(u'\\') + 1)));
  }
  return names;
}

}  // namespace bench
