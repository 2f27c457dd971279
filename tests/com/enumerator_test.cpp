// The two kinds of lists: nodes, and values.
#include <array>
#include <memory>

#include "com/node_enumerator.h"
#include "com/variant_enumerator.h"
#include "platform/com_controls.h"
#include "tests/support/client_node.h"
#include "tests/support/com_objects.h"

namespace KelvoUHW {
namespace {

using platform::controls::FailCriticalSection;
using platform::controls::FailingBstr;

using NodeEnumerator = ComObjects;

ComPtr<IZKUMUsbTreeNodeEnumerator> EnumeratorOver(VariantVector elements) {
  auto items = std::make_unique<VariantVector>(std::move(elements));
  ComPtr<IZKUMUsbTreeNodeEnumerator> list;
  EXPECT_EQ(CreateNodeEnumerator(items, list.Put()), S_OK);
  EXPECT_EQ(items, nullptr);
  return list;
}

bool Move(IZKUMUsbTreeNodeEnumerator* list) {
  VARIANT_BOOL more = 0x5A5A;
  EXPECT_EQ(list->MoveNext(&more), S_OK);
  EXPECT_TRUE(more == VARIANT_TRUE || more == VARIANT_FALSE) << more;
  return more == VARIANT_TRUE;
}

TEST_F(NodeEnumerator, IsMadeOfAVectorThatItTakesOver) {
  ClientNode node(KUDTHub);
  std::unique_ptr<VariantVector> items;
  auto* list = Mark<IZKUMUsbTreeNodeEnumerator>();
  EXPECT_EQ(CreateNodeEnumerator(items, &list), E_POINTER);
  EXPECT_EQ(list, nullptr);
  EXPECT_EQ(CreateNodeEnumerator(items, nullptr), E_POINTER);

  items = std::make_unique<VariantVector>();
  items->push_back(Variant::OfUnknown(static_cast<IZKUMUsbTreeNode*>(&node)));
  FailCriticalSection(1, E_ACCESSDENIED);
  EXPECT_EQ(CreateNodeEnumerator(items, &list), E_ACCESSDENIED);
  EXPECT_EQ(list, nullptr);
  ASSERT_TRUE(items);
  EXPECT_EQ(node.references, 1u);
}

TEST_F(NodeEnumerator, WalksOnceAndGoesOnBehindTheEnd) {
  EXPECT_FALSE(Move(EnumeratorOver({}).Get()));
  const SampleTree sample;
  const auto node = Wrap(sample.hub);
  VariantVector elements;
  elements.push_back(Variant::OfUnknown(ComPtr<IZKUMUsbTreeNode>(node).Detach()));
  elements.push_back(Variant::OfUnknown(nullptr));
  elements.push_back(Variant::OfLong(3));
  elements.push_back(Variant::OfUnknown(ComPtr<IZKUMUsbTreeNode>(node).Detach()));
  elements.back().vt = VT_DISPATCH;
  const auto list = EnumeratorOver(std::move(elements));

  const auto current = [&] {
    IZKUMUsbTreeNode* element = Mark<IZKUMUsbTreeNode>();
    const HRESULT result = list->GetCurrent(&element);
    EXPECT_EQ(element, FAILED(result) ? nullptr : node.Get());
    if (element) element->Release();
    return result;
  };
  // The element is looked at before the pointer is.
  EXPECT_EQ(list->GetCurrent(nullptr), E_FAIL);
  for (const HRESULT expected : {E_FAIL, S_OK, E_FAIL, E_FAIL, S_OK}) {
    EXPECT_EQ(current(), expected);
    EXPECT_EQ(current(), expected);
    if (expected == S_OK) {
      EXPECT_EQ(list->GetCurrent(nullptr), E_POINTER);
    }
    Move(list.Get());
  }
  for (int i = 0; i < 100; ++i) EXPECT_FALSE(Move(list.Get()));
  EXPECT_EQ(current(), E_FAIL);
  EXPECT_EQ(References(node.Get()), 3u);
}

// An object that is taken apart still counts: nothing may unload the module before it is done.
TEST_F(NodeEnumerator, LetsTheModuleGoLast) {
  struct Witness final : IUnknown {
    HRESULT STDMETHODCALLTYPE QueryInterface(REFIID, void**) override { return E_NOINTERFACE; }
    ULONG STDMETHODCALLTYPE AddRef() override { return 2; }
    ULONG STDMETHODCALLTYPE Release() override {
      objectsAtRelease = ModuleLockCount();
      return 1;
    }
    std::int32_t objectsAtRelease = 0;
  } witness;
  VariantVector elements;
  elements.push_back(Variant::OfUnknown(&witness));
  auto list = EnumeratorOver(std::move(elements));
  const std::int32_t objects = ModuleLockCount();
  list.Reset();
  EXPECT_EQ(witness.objectsAtRelease, objects);
}

class Collection : public ComObjects {
 protected:
  Collection() {
    for (const char16_t* text : {u"a", u"b", u"c"}) items.push_back(Variant::OfBstr(platform::MakeBstr(text)));
  }
  ComPtr<IEnumVARIANT> Make(const VariantVector* vector) {
    ComPtr<IEnumVARIANT> made;
    EXPECT_EQ(MakeVariantEnum(made.Put(), static_cast<IZKUMUsbTreeNode*>(&owner), vector), S_OK);
    return made;
  }
  // "CODE fetched: texts"; elements behind those fetched must be as they were.
  static std::string Next(IEnumVARIANT* list, ULONG celt) {
    std::array<VARIANT, 6> out;
    for (VARIANT& element : out) element.vt = 0x5A5A;
    ULONG fetched = 0x5A5A;
    const HRESULT result = list->Next(celt, out.data(), &fetched);
    std::string text = CodeName(result) + " " + std::to_string(fetched) + ":";
    for (ULONG i = 0; i < out.size(); ++i) {
      if (i < fetched) {
        EXPECT_EQ(out[i].vt, VT_BSTR);
        text += " " + platform::ToUtf8(platform::BstrText(out[i].bstrVal));
        VariantClear(&out[i]);
      } else {
        EXPECT_TRUE(out[i].vt == 0x5A5A || out[i].vt == VT_EMPTY) << i;
      }
    }
    return text;
  }

  VariantVector items;
  ClientNode owner{KUDTHub};
};

TEST_F(Collection, NextSkipResetAndCloneInTurn) {
  const std::pair<const char*, const char*> rows[] = {
      {"n0 n1 n5 n1", "S_OK 0:, S_OK 1: a, S_FALSE 2: b c, S_FALSE 0:"},
      {"s0 s1 r n3", "S_OK, S_FALSE, S_OK, S_OK 3: a b c"},
      {"r s1 n1 c n1", "S_OK, S_OK, S_OK 1: b, S_OK, S_OK 1: c"},
      {"c n1 r s4294967295 n1", "S_OK, S_FALSE 0:, S_OK, S_FALSE, S_FALSE 0:"},
      // Exactly what is left is no shortage.
      {"r s3 n1 s0 s1", "S_OK, S_OK, S_FALSE 0:, S_OK, S_FALSE"},
      {"r n1 s2 n1 r n3", "S_OK, S_OK 1: a, S_OK, S_FALSE 0:, S_OK, S_OK 3: a b c"}};
  auto list = Make(&items);
  const auto next = [](IEnumVARIANT* from, ULONG count, bool) { return Next(from, count); };
  for (const auto& [steps, expected] : rows) EXPECT_EQ(Play(list, steps, next), expected) << steps;
  EXPECT_EQ(owner.references, 2u) << "the clone keeps the owner, and nobody else does";
  list.Reset();
  EXPECT_EQ(owner.references, 1u);
}

TEST_F(Collection, RefusesWhatItCannotDo) {
  const auto list = Make(&items);
  std::array<VARIANT, 2> out{};
  ULONG fetched = 0x5A5A;
  EXPECT_EQ(list->Next(2, out.data(), nullptr), E_POINTER);
  EXPECT_EQ(list->Next(1, nullptr, nullptr), E_POINTER);
  EXPECT_EQ(list->Next(1, nullptr, &fetched), E_POINTER);
  EXPECT_EQ(fetched, 0u);
  EXPECT_EQ(list->Next(1, out.data(), nullptr), S_OK);
  VariantClear(out.data());
  EXPECT_EQ(list->Clone(nullptr), E_POINTER);
  EXPECT_EQ(MakeVariantEnum(nullptr, nullptr, &items), E_POINTER);

  for (const bool clone : {true, false}) {
    auto* made = Mark<IEnumVARIANT>();
    FailCriticalSection(1, E_ACCESSDENIED);
    EXPECT_EQ(clone ? list->Clone(&made) : MakeVariantEnum(&made, nullptr, &items), E_ACCESSDENIED);
    EXPECT_EQ(made, nullptr);
  }

  const auto without = Make(nullptr);
  EXPECT_EQ(Next(without.Get(), 1), "E_FAIL 0:");
  EXPECT_EQ(without->Reset(), E_FAIL);
  for (const ULONG celt : {0u, 1u}) EXPECT_EQ(without->Skip(celt), celt == 0 ? S_OK : E_FAIL);
}

TEST_F(Collection, ACopyThatFailsTakesTheOthersOfItsCallBack) {
  const auto list = Make(&items);
  for (std::uint64_t allocation = 1; allocation <= 3; ++allocation) {
    ASSERT_EQ(list->Reset(), S_OK);
    std::array<VARIANT, 3> out;
    for (VARIANT& element : out) element.vt = 0x5A5A;
    ULONG fetched = 0x5A5A;
    {
      const FailingBstr failing(allocation);
      EXPECT_EQ(list->Next(3, out.data(), &fetched), E_OUTOFMEMORY);
    }
    EXPECT_EQ(fetched, 0u);
    for (std::size_t i = 0; i < out.size(); ++i) EXPECT_EQ(out[i].vt, i < allocation ? VT_EMPTY : 0x5A5A) << i;
    // The one that failed comes next.
    EXPECT_EQ(Next(list.Get(), 1), std::string("S_OK 1: ") + "abc"[allocation - 1]);
  }
}

}  // namespace
}  // namespace KelvoUHW
