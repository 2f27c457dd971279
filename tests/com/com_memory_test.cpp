// The trees of real PCs, read while each allocation in turn fails: texts with the system's allocator, all else
// with ours.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <string>
#include <vector>

#include "platform/simulated/machine_file.h"
#include "platform/simulated/simulated_pc.h"
#include "tests/support/com_objects.h"
#include "tests/support/failing_memory.h"
#include "tests/support/text_properties.h"
#include "tree/tree_builder.h"

namespace KelvoUHW {
namespace {

void LetGo(IUnknown* object) { object->Release(); }
void LetGo(char16_t* text) { SysFreeString(text); }

// What came of a call, without any memory of its own.
struct Outcome {
  HRESULT code = S_OK;
  bool raised = false;
  bool cleared = false;  // the out pointer
};
template <class T, class Call>
Outcome Try(Call call) {
  T* out = Mark<T>();
  Outcome outcome;
  try {
    outcome.code = call(&out);
  } catch (const ComError& error) {
    outcome = {error.Code(), true};
  }
  outcome.cleared = out == nullptr;
  if (outcome.code == S_OK) LetGo(out);
  return outcome;
}

class ComMemory : public ComObjects, public testing::WithParamInterface<const char*> {
 protected:
  ComMemory() {
    EXPECT_TRUE(builder.Build());
    VisitPreOrder(builder.Root(), [&](const NodePtr& node) {
      nodes.push_back(node);
      return true;
    });
    m_pointers = Pointers();
  }
  ~ComMemory() override { EXPECT_EQ(Pointers(), m_pointers); }

  std::size_t Pointers() const {
    std::size_t count = 0;
    for (const NodePtr& node : nodes) count += node.RingSize();
    return count;
  }

  // Fails the 1st, 2nd, ... allocation until there is none left; returns how many there were.
  template <class Call>
  std::uint64_t FailEach(std::initializer_list<HRESULT> codes, Call call) {
    const std::int32_t objects = ModuleLockCount();
    const std::int64_t texts = platform::native::CountBstrs().alive;
    for (std::uint64_t allocation = 1;; ++allocation) {
      Outcome outcome;
      bool failed = false;
      {
        const FailingAllocation failing(allocation);
        outcome = call();
        failed = failing.Failed();
      }
      EXPECT_EQ(ModuleLockCount(), objects) << allocation;
      EXPECT_EQ(platform::native::CountBstrs().alive, texts) << allocation;
      if (!failed) {
        EXPECT_EQ(outcome.code, S_OK);
        return allocation - 1;
      }
      EXPECT_TRUE(std::count(codes.begin(), codes.end(), outcome.code)) << allocation << CodeName(outcome.code);
      EXPECT_TRUE(outcome.cleared) << allocation;
      EXPECT_FALSE(outcome.raised) << allocation;
      if (HasFailure()) return 0;
    }
  }

  platform::simulated::SimulatedPc pc{
      platform::simulated::LoadMachine(std::string(ZKUSB_SOURCE_DIR "/machines/") + GetParam() + ".json")};
  CZKUMUsbTreeBuilder builder{pc};
  std::vector<NodePtr> nodes;

 private:
  std::size_t m_pointers = 0;
};

TEST_P(ComMemory, TextsOfEveryNode) {
  const std::vector<TextRow> rows = TextRows();
  std::size_t read = 0;
  for (const NodePtr& node : nodes) {
    const auto object = Wrap(node);
    const std::string kind = SampleTree::NameOf(node->m_nType);
    for (const TextRow& row : rows) {
      if (std::count(row.kinds.begin(), row.kinds.end(), kind) == 0) continue;
      const std::string text = TextOf(row.property, object.Get());
      // A port device without device-manager node answers nothing of that node's.
      if (text == "E_FAIL null" && row.source) continue;
      SCOPED_TRACE(row.name + text);
      CheckText(row.property, object.Get(), row.rules, text.substr(sizeof "S_OK"));
      ++read;
    }
  }
  EXPECT_GT(read, 6 * nodes.size());
}

TEST_P(ComMemory, ListsAndCollectionsOfEveryNode) {
  // No device of these PCs shows its interfaces.
  const SampleTree sample;
  for (int i = 0; i < 3; ++i) sample.device->m_interfaceDescrs.push_back(MakeRecord<InterfaceEntry>());
  std::vector<NodePtr> all = sample.Nodes();
  all.insert(all.end(), nodes.begin(), nodes.end());

  // The collection of a new object, with which it goes.
  const auto failCollection = [&](const NodePtr& node, auto getter) {
    return FailEach({E_OUTOFMEMORY}, [&] {
      return Try<IEnumVARIANT>([&](auto out) {
        *out = nullptr;
        ComPtr<IZKUMUsbTreeNode> object;
        const HRESULT result = CreateNodeObject(node, object.Put());
        return FAILED(result) ? result : getter(object.Get(), out);
      });
    });
  };
  std::uint64_t failures = 0;
  for (const NodePtr& node : all) {
    const auto object = Wrap(node);
    failures += FailEach({E_POINTER, E_OUTOFMEMORY}, [&] {
      return Try<IZKUMUsbTreeNodeEnumerator>([&](auto out) { return object->get_Childs(out); });
    });
    if (node->m_nType == KUDTPortDevice) {
      failures += failCollection(node, &Read<&IZKUMPortDevice::get_InterfaceDescriptors>);
    }
    if (node->m_nType == KUDTInterfaceDevice) {
      failures += failCollection(node, &Read<&IZKUMInterfaceDevice::get_MountPoints>);
    }
  }
  EXPECT_GT(failures, 2 * all.size());
}

TEST_P(ComMemory, SubtreesAndDumpOfTheWholeTree) {
  const auto root = Wrap(builder.Root());
  for (std::int32_t kind = KUDTUnknown; kind <= KUDTInterfaceDevice; ++kind) {
    FailEach({E_POINTER, E_OUTOFMEMORY}, [&] {
      return Try<IZKUMUsbTreeNodeEnumerator>(
          [&](auto out) { return root->get_InSubtreeDevicesOfType(static_cast<TUsbDeviceType>(kind), out); });
    });
  }
  const std::uint64_t failures = FailEach({E_OUTOFMEMORY}, [&] {
    return Try<char16_t>([&](auto out) { return Read<&IZKUMUsbDevice::get_ToString>(root.Get(), out); });
  });
  EXPECT_GT(failures, nodes.size());
}

INSTANTIATE_TEST_SUITE_P(Machines, ComMemory,
                         testing::Values("asus-b560", "dell-precision", "hp-cardreader", "vmware-win7"),
                         [](const auto& machine) {
                           std::string name = machine.param;
                           std::erase(name, '-');
                           return name;
                         });

// A list that cannot be made ends the search in it, and what does not come out of a search is not touched.
TEST_F(ComObjects, SearchWithoutMemory) {
  const SampleTree sample;
  const auto root = Wrap(sample.root);
  const auto searcher = Wrap(sample.device).As<IZKUMPortDevice>();
  HRESULT result = E_FAIL;
  std::uint64_t allocation = 0;
  while (result != S_OK) {
    IZKUMUsbTreeNode* found = Mark<IZKUMUsbTreeNode>();
    const std::int32_t objects = ModuleLockCount();
    {
      const FailingAllocation failing(++allocation);
      result = searcher->get_FirstChildOfType(root.Get(), KUDTInterfaceDevice, &found);
      ASSERT_EQ(failing.Failed(), result != S_OK) << allocation;
    }
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
      const platform::native::FailingBstr failing(allocation);
      auto* list = Mark<IEnumVARIANT>();
      EXPECT_EQ(CodeOf([&] { return disk->get_MountPoints(giveOut ? &list : nullptr); }), "raised E_OUTOFMEMORY");
      EXPECT_EQ(list, giveOut ? nullptr : Mark<IEnumVARIANT>());
    }
  }
  ComPtr<IEnumVARIANT> list;
  ASSERT_EQ(disk->get_MountPoints(list.Put()), S_OK);
  std::array<VARIANT, 4> out{};
  ULONG fetched = 0;
  EXPECT_EQ(list->Next(4, out.data(), &fetched), S_FALSE);
  ASSERT_EQ(fetched, sample.disk->MountPoints.size());
  for (ULONG i = 0; i < fetched; ++i) {
    EXPECT_EQ(platform::BstrText(out[i].bstrVal), sample.disk->MountPoints[i]);
    VariantClear(&out[i]);
  }
}

}  // namespace
}  // namespace KelvoUHW
