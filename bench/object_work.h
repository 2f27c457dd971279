// What clients do with a published tree, over generated PCs: read all of it, dump it, query it.
#pragma once

#include <cstddef>
#include <cstdint>

#include "com/com_ptr.h"
#include "com/zkusb_monitor.h"
#include "simulation/machine/generated.h"
#include "simulation/pc/simulated_pc.h"

namespace bench {

enum class ObjectWork : std::uint8_t {
  Read,     // every node through Childs, every property of every interface but Parent and ToString
  Dump,     // ToString of the root
  Subtree,  // all interface devices below the root, taken from their list
  Vendor,   // the three queries of the tree, each device taken from its list
  Product,
  Volume,
};
inline constexpr ObjectWork kObjectWorks[] = {ObjectWork::Read,    ObjectWork::Dump,
                                              ObjectWork::Subtree, ObjectWork::Vendor,
                                              ObjectWork::Product, ObjectWork::Volume};
const char* NameOf(ObjectWork work) noexcept;

// What one piece of work cost, in exact numbers.
struct ObjectCost {
  double nodes = 0;    // of the tree
  double brought = 0;  // nodes that the work brought
  double allocations = 0;
  double texts = 0;  // BSTRs: two for each that is read, one of them is the caller's
};

// A tree object over a generated PC, built once. The PC is the system of this process meanwhile:
// one at a time.
class ObjectWorkload {
 public:
  ObjectWorkload(platform::simulated::GeneratedShape shape, std::size_t devices);
  ~ObjectWorkload();
  ObjectWorkload(const ObjectWorkload&) = delete;
  ObjectWorkload& operator=(const ObjectWorkload&) = delete;

  // Does the work; returns how many nodes it brought. Throws std::logic_error when a call fails.
  std::size_t Run(ObjectWork work) const;
  ObjectCost CostOf(ObjectWork work) const;

 private:
  KelvoUHW::ComPtr<IZKUMUsbTreeNode> Root() const;
  std::size_t ReadAll() const;
  void Dump() const;

  platform::simulated::SimulatedPc m_pc;
  KelvoUHW::ComPtr<IZKUMUsbTree> m_tree;
  std::size_t m_nodes = 0;
};

}  // namespace bench
