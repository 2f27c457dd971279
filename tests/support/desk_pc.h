// A desktop PC and a builder that sees it, for tests of whole builds.
#pragma once

#include <gtest/gtest.h>

#include "bench/plugs.h"
#include "simulation/pc/simulated_pc.h"
#include "tree/tree_builder.h"

namespace KelvoUHW {

using platform::simulated::OpenCounts;
using platform::simulated::SimulatedPc;

// The last components of the instance ids: "S1 CR", "-" for none, "?" for an empty id.
inline std::string ShortNames(const DeviceList& list) {
  std::string names;
  for (const NodePtr& node : list) {
    const std::u16string& id = node->m_strDevInstId;
    names += (names.empty() ? "" : " ") + (id.empty() ? "?" : platform::ToUtf8(id.substr(id.rfind(u'\\') + 1)));
  }
  return names.empty() ? "-" : names;
}

// "connected | attached | removed | modified".
inline std::string ListsText(const CZKUMUsbTreeBuilder& builder) {
  std::string text;
  for (std::size_t kind = kConnectedList; kind <= kModifiedList; ++kind) {
    text += (kind == 0 ? "" : " | ") + ShortNames(*builder.GetDeviceList(kind));
  }
  return text;
}

// A PC with devices, and a builder that sees it through a host.
template <class Host>
struct Desk {
  explicit Desk(Machine machine, const std::vector<Change>& devices = {}) : pc(std::move(machine)) { Do(devices); }

  void Do(const std::vector<Change>& changes) {
    for (const Change& change : changes) ASSERT_EQ(pc.Apply({0, u"", change}), u"");
  }
  std::vector<DeviceList> Lists() const {
    std::vector<DeviceList> lists;
    for (std::size_t kind = kConnectedList; kind <= kModifiedList; ++kind)
      lists.push_back(*builder.GetDeviceList(kind));
    return lists;
  }

  SimulatedPc pc;
  Host host{pc};
  CZKUMUsbTreeBuilder builder{host};
};

}  // namespace KelvoUHW
