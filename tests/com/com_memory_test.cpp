// The tree of a real PC, read while each allocation in turn fails: texts are the system's, all else is ours.
#include <gmock/gmock.h>

#include "simulation/machine/machine_file.h"
#include "simulation/pc/simulated_pc.h"
#include "tests/support/com_objects.h"
#include "tests/support/failing_memory.h"
#include "tree/tree_builder.h"

namespace KelvoUHW {
namespace {

void LetGo(IUnknown* object) { object->Release(); }
void LetGo(BSTR text) { SysFreeString(text); }

class ComMemory : public ComObjects {
 protected:
  ComMemory() {
    EXPECT_TRUE(builder.Build());
    VisitPreOrder(builder.Root(), [&](const NodePtr& node) {
      nodes.push_back(node);
      return true;
    });
    m_rings = Rings();
  }
  ~ComMemory() override { EXPECT_EQ(Rings(), m_rings); }

  // Fails the 1st, 2nd, ... allocation until there is none left; returns how many there were.
  template <class T, class Call>
  std::uint64_t FailEach(std::initializer_list<HRESULT> codes, Call call) {
    const std::int32_t objects = ModuleLockCount();
    const std::int64_t texts = platform::controls::CountBstrs().alive;
    for (std::uint64_t allocation = 1;; ++allocation) {
      T* out = Mark<T>();
      bool failed = false, cleared = false;
      const HRESULT code = WithoutAllocation(allocation, failed, [&] {
        const HRESULT result = call(&out);
        cleared = out == nullptr;
        if (result == S_OK) LetGo(out);
        return result;
      });
      EXPECT_EQ(ModuleLockCount(), objects) << allocation;
      EXPECT_EQ(platform::controls::CountBstrs().alive, texts) << allocation;
      if (!failed) {
        EXPECT_EQ(code, S_OK);
        return allocation - 1;
      }
      EXPECT_THAT(codes, testing::Contains(code)) << allocation;
      EXPECT_TRUE(cleared) << allocation;
      if (HasFailure()) return 0;
    }
  }

  platform::simulated::SimulatedPc pc{
      platform::simulated::LoadMachine(ZKUSB_SOURCE_DIR "/machines/dell-precision.json")};
  CZKUMUsbTreeBuilder builder{pc};
  std::vector<NodePtr> nodes;

 private:
  std::vector<std::size_t> Rings() const {
    std::vector<std::size_t> sizes;
    for (const NodePtr& node : nodes) sizes.push_back(node.RingSize());
    return sizes;
  }
  std::vector<std::size_t> m_rings;
};

TEST_F(ComMemory, ListsAndCollectionsOfEveryNode) {
  // No device of the PC shows its interfaces.
  const SampleTree sample;
  for (int i = 0; i < 3; ++i) sample.device->m_interfaceDescrs.push_back(MakeRecord<InterfaceEntry>());
  std::vector<NodePtr> all = sample.Nodes();
  all.insert(all.end(), nodes.begin(), nodes.end());

  // The collection of a new object, with which it goes.
  const auto failCollection = [&](const NodePtr& node, auto getter) {
    return FailEach<IEnumVARIANT>({E_OUTOFMEMORY}, [&](auto out) {
      *out = nullptr;
      ComPtr<IZKUMUsbTreeNode> object;
      const HRESULT result = CreateNodeObject(node, object.Put());
      return FAILED(result) ? result : getter(object.Get(), out);
    });
  };
  std::uint64_t failures = 0;
  for (const NodePtr& node : all) {
    const auto object = Wrap(node);
    failures += FailEach<IZKUMUsbTreeNodeEnumerator>({E_POINTER, E_OUTOFMEMORY},
                                                     [&](auto out) { return object->get_Childs(out); });
    failures +=
        node->m_nType == KUDTPortDevice        ? failCollection(node, &Read<&IZKUMPortDevice::get_InterfaceDescriptors>)
        : node->m_nType == KUDTInterfaceDevice ? failCollection(node, &Read<&IZKUMInterfaceDevice::get_MountPoints>)
                                               : 0;
  }
  EXPECT_GT(failures, 2 * all.size());
}

TEST_F(ComMemory, SubtreesAndDumpOfTheWholeTree) {
  const auto root = Wrap(builder.Root());
  for (std::int32_t kind = KUDTUnknown; kind <= KUDTInterfaceDevice; ++kind) {
    FailEach<IZKUMUsbTreeNodeEnumerator>({E_POINTER, E_OUTOFMEMORY}, [&](auto out) {
      return root->get_InSubtreeDevicesOfType(static_cast<TUsbDeviceType>(kind), out);
    });
  }
  const std::uint64_t failures = FailEach<OLECHAR>(
      {E_OUTOFMEMORY}, [&](auto out) { return Read<&IZKUMUsbDevice::get_ToString>(root.Get(), out); });
  EXPECT_GT(failures, nodes.size());
}

// A list that cannot be made ends the search in it, and what does not come out of a search is not touched.
TEST_F(ComObjects, SearchWithoutMemory) {
  const SampleTree sample;
  const auto root = Wrap(sample.root);
  const auto searcher = Wrap(sample.device).As<IZKUMPortDevice>();
  std::uint64_t allocation = 0;
  for (bool failed = true; failed;) {
    IZKUMUsbTreeNode* found = Mark<IZKUMUsbTreeNode>();
    const std::int32_t objects = ModuleLockCount();
    const HRESULT result = WithoutAllocation(
        ++allocation, failed, [&] { return searcher->get_FirstChildOfType(root.Get(), KUDTInterfaceDevice, &found); });
    ASSERT_EQ(failed, result != S_OK) << allocation;
    ASSERT_TRUE(result == S_OK || result == S_FALSE || result == E_OUTOFMEMORY) << CodeName(result);
    ASSERT_EQ(found == Mark<IZKUMUsbTreeNode>(), result != S_OK);
    if (result == S_OK) found->Release();
    ASSERT_EQ(ModuleLockCount(), objects);
  }
  EXPECT_GT(allocation, 20u);
}

// A mount point that cannot be copied is the one thing that raises and is no text property.
TEST_F(ComObjects, MountPointsThatCannotBeCopied) {
  SampleTree sample;
  const auto disk = Wrap(sample.disk).As<IZKUMInterfaceDevice>();
  for (std::uint64_t allocation = 1; allocation <= sample.disk->MountPoints.size(); ++allocation) {
    for (const bool giveOut : {true, false}) {
      const platform::controls::FailingBstr failing(allocation);
      auto* list = Mark<IEnumVARIANT>();
      EXPECT_EQ(CodeOf([&] { return disk->get_MountPoints(giveOut ? &list : nullptr); }), "raised E_OUTOFMEMORY");
      EXPECT_EQ(list, giveOut ? nullptr : Mark<IEnumVARIANT>());
    }
  }
  EXPECT_EQ(disk->get_MountPoints(nullptr), E_POINTER);
  std::vector<std::u16string> texts;
  EXPECT_EQ(testing_support::ForEachElement(
                *disk.Get(), &IZKUMInterfaceDevice::get_MountPoints,
                [&](const Variant& element) { texts.emplace_back(platform::BstrText(element.bstrVal)); }),
            S_OK);
  EXPECT_EQ(texts, sample.disk->MountPoints);
}

}  // namespace
}  // namespace KelvoUHW
