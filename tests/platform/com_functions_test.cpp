// The system's COM functions of builds without the system.
#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <thread>

#include "platform/com.h"

namespace {

using platform::native::CountBstrs;
using platform::native::FailingBstr;
using namespace std::string_view_literals;

TEST(ComFunctions, TextsCarryTheirLengthInBytesBeforeThem) {
  const std::int64_t alive = CountBstrs().alive, allocated = CountBstrs().allocated;
  for (const std::u16string_view text : {u""sv, u"a"sv, u"a\0b"sv}) {
    const BSTR made = SysAllocStringLen(text.data(), static_cast<UINT>(text.size()));
    ASSERT_NE(made, nullptr);
    std::uint32_t prefix = 0;
    std::memcpy(&prefix, reinterpret_cast<const char*>(made) - 4, sizeof prefix);
    EXPECT_EQ(prefix, 2 * text.size());
    EXPECT_EQ(SysStringByteLen(made), prefix);
    EXPECT_EQ(SysStringLen(made), text.size());
    EXPECT_EQ(platform::BstrText(made), text);
    EXPECT_EQ(made[text.size()], u'\0');
    EXPECT_EQ(CountBstrs().alive, alive + 1);
    SysFreeString(made);
  }
  const BSTR cut = SysAllocString(u"a\0b");
  EXPECT_EQ(SysStringLen(cut), 1u);
  SysFreeString(cut);
  EXPECT_EQ(SysAllocString(nullptr), nullptr);
  EXPECT_EQ(SysAllocStringLen(nullptr, 0xFFFFFFFF), nullptr);
  EXPECT_EQ(SysStringLen(nullptr), 0u);
  SysFreeString(nullptr);
  EXPECT_EQ(CountBstrs().alive, alive);
  EXPECT_EQ(CountBstrs().allocated, allocated + 4);
}

struct CountedUnknown final : IDispatch {
  HRESULT QueryInterface(REFIID, void**) override { return E_NOINTERFACE; }
  ULONG AddRef() override { return ++references; }
  ULONG Release() override { return --references; }
  HRESULT GetTypeInfoCount(UINT*) override { return E_NOTIMPL; }
  HRESULT GetTypeInfo(UINT, LCID, ITypeInfo**) override { return E_NOTIMPL; }
  HRESULT GetIDsOfNames(REFIID, LPOLESTR*, UINT, LCID, DISPID*) override { return E_NOTIMPL; }
  HRESULT Invoke(DISPID, REFIID, LCID, WORD, DISPPARAMS*, VARIANT*, EXCEPINFO*, UINT*) override { return E_NOTIMPL; }
  ULONG references = 1;
};

TEST(ComFunctions, VariantsOwnWhatTheyHold) {
  const std::int64_t alive = CountBstrs().alive;
  CountedUnknown object;
  const struct {
    VARTYPE type;
    HRESULT result;
  } rows[] = {{VT_EMPTY, S_OK},
              {VT_I2, S_OK},
              {VT_I4, S_OK},
              {VT_BSTR, S_OK},
              {VT_DISPATCH, S_OK},
              {VT_BOOL, S_OK},
              {VT_UI1, S_OK},
              {VT_UI4, S_OK},
              {VT_UNKNOWN, S_OK},
              {VARTYPE{7}, DISP_E_BADVARTYPE},
              {VARTYPE{0x4003}, DISP_E_BADVARTYPE}};
  for (const auto& row : rows) {
    for (const bool null : {false, true}) {
      const bool isObject = row.type == VT_UNKNOWN || row.type == VT_DISPATCH;
      VARIANT source{}, target{};
      source.vt = row.type;
      source.lVal = 77;
      if (row.type == VT_BSTR) source.bstrVal = null ? nullptr : SysAllocString(u"text");
      if (isObject) source.punkVal = null ? nullptr : &object;
      target.vt = VT_BSTR;
      target.bstrVal = SysAllocString(u"what the target held");
      EXPECT_EQ(VariantCopy(&target, &source), row.result) << row.type;
      if (FAILED(row.result)) {
        EXPECT_EQ(target.vt, VT_EMPTY);
        EXPECT_EQ(VariantClear(&source), row.result);
        EXPECT_EQ(VariantCopy(&source, &target), row.result);
        EXPECT_EQ(source.lVal, 77);
        continue;
      }
      EXPECT_EQ(target.vt, row.type);
      if (row.type == VT_BSTR) {
        EXPECT_EQ(platform::BstrText(target.bstrVal), null ? u"" : u"text");
        EXPECT_EQ(target.bstrVal == source.bstrVal, null);
      } else {
        EXPECT_EQ(target.byref, source.byref);
      }
      EXPECT_EQ(object.references, isObject && !null ? 2u : 1u);
      if (isObject && !null) ++object.references;  // the source's own
      EXPECT_EQ(VariantCopy(&target, &target), S_OK);
      EXPECT_EQ(VariantClear(&target), S_OK);
      EXPECT_EQ(VariantClear(&source), S_OK);
      EXPECT_EQ(source.vt, VT_EMPTY);
      EXPECT_EQ(object.references, 1u);
      EXPECT_EQ(CountBstrs().alive, alive);
    }
  }
}

TEST(ComFunctions, TheNthTextFailsAndOnlyOnThisThread) {
  VARIANT source{}, target{};
  source.vt = VT_BSTR;
  source.bstrVal = SysAllocString(u"text");
  const FailingBstr failing(2);
  EXPECT_EQ(VariantCopy(&target, &source), S_OK);
  std::thread([&] {
    SysFreeString(SysAllocString(u"other"));
    SysFreeString(SysAllocString(u"more"));
  }).join();
  EXPECT_FALSE(failing.Failed());
  EXPECT_EQ(VariantCopy(&target, &source), E_OUTOFMEMORY);
  EXPECT_EQ(target.vt, VT_EMPTY);
  EXPECT_TRUE(failing.Failed());
  EXPECT_EQ(VariantCopy(&target, &source), S_OK);
  VariantClear(&target);
  VariantClear(&source);
}

TEST(ComFunctions, ApartmentsNestPerThread) {
  const struct {
    HRESULT ordered;  // S_OK: none
    DWORD model;
    HRESULT result;
    std::uint32_t depth;
  } rows[] = {{E_OUTOFMEMORY, COINIT_MULTITHREADED, E_OUTOFMEMORY, 0},
              {S_OK, COINIT_APARTMENTTHREADED, S_OK, 1},
              {S_OK, COINIT_MULTITHREADED, RPC_E_CHANGED_MODE, 1},
              {S_OK, COINIT_APARTMENTTHREADED, S_FALSE, 2}};
  for (const auto& row : rows) {
    if (FAILED(row.ordered)) platform::native::FailNextCoInitialize(row.ordered);
    EXPECT_EQ(CoInitializeEx(nullptr, row.model), row.result);
    EXPECT_EQ(platform::native::ApartmentDepth(), row.depth);
  }
  std::thread([] { EXPECT_EQ(platform::native::ApartmentDepth(), 0u); }).join();
  for (const std::uint32_t depth : {1u, 0u, 0u}) {
    CoUninitialize();
    EXPECT_EQ(platform::native::ApartmentDepth(), depth);
  }
  EXPECT_EQ(CoInitializeEx(nullptr, COINIT_MULTITHREADED), S_OK);
  CoUninitialize();
}

}  // namespace
