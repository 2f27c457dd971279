// The system's COM functions, as builds without the system have them and as the component relies on them; and what
// counts and fails them.
#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <thread>

#include "platform/com.h"
#include "platform/com_controls.h"

namespace {

using platform::controls::CountBstrs;
using namespace std::string_view_literals;

TEST(ComFunctions, TextsCarryTheirLengthInBytesBeforeThem) {
  const auto [alive, allocated] = CountBstrs();
  for (const std::u16string_view text : {u""sv, u"a"sv, u"a\0b"sv}) {
    const BSTR made = SysAllocStringLen(platform::ToSystemText(text.data()), static_cast<UINT>(text.size()));
    ASSERT_NE(made, nullptr);
    std::uint32_t prefix = 0;
    std::memcpy(&prefix, reinterpret_cast<const char*>(made) - 4, sizeof prefix);
    EXPECT_EQ(prefix, 2 * text.size());
    EXPECT_EQ(SysStringByteLen(made), prefix);
    EXPECT_EQ(std::tuple(SysStringLen(made), platform::BstrText(made)), std::tuple(text.size(), text));
    EXPECT_EQ(made[text.size()], OLECHAR{});
    EXPECT_EQ(CountBstrs().alive, alive + 1);
    SysFreeString(made);
  }
  const BSTR cut = SysAllocString(platform::ToSystemText(u"a\0b"));
  EXPECT_EQ(SysStringLen(cut), 1u);
  SysFreeString(cut);
  EXPECT_EQ(SysAllocString(nullptr), nullptr);
  EXPECT_EQ(SysAllocStringLen(nullptr, 0xFFFFFFFF), nullptr);
  EXPECT_EQ(SysStringLen(nullptr), 0u);
  SysFreeString(nullptr);
  EXPECT_EQ(std::pair(CountBstrs().alive, CountBstrs().allocated), std::pair(alive, allocated + 4));
}

struct CountedUnknown final : IUnknown {
  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID, void**) override { return E_NOINTERFACE; }
  ULONG STDMETHODCALLTYPE AddRef() override { return ++references; }
  ULONG STDMETHODCALLTYPE Release() override { return --references; }
  ULONG references = 1;
};

TEST(ComFunctions, VariantsOwnWhatTheyHold) {
  const std::int64_t alive = CountBstrs().alive;
  CountedUnknown object;
  for (const VARTYPE type : {VT_EMPTY, VT_I2, VT_I4, VT_BSTR, VT_DISPATCH, VT_BOOL, VT_UI1, VT_UI4, VT_UNKNOWN}) {
    for (const bool null : {false, true}) {
      const bool isObject = type == VT_UNKNOWN || type == VT_DISPATCH;
      VARIANT source{}, target{};
      source.vt = type;
      source.lVal = 77;
      if (type == VT_BSTR) source.bstrVal = null ? nullptr : platform::MakeBstr(u"text");
      if (isObject) source.punkVal = null ? nullptr : &object;
      target.vt = VT_BSTR;
      target.bstrVal = platform::MakeBstr(u"what the target held");
      EXPECT_EQ(VariantCopy(&target, &source), S_OK) << type;
      EXPECT_EQ(target.vt, type);
      const bool isText = type == VT_BSTR && !null;
      EXPECT_EQ(isText ? platform::BstrText(target.bstrVal) : u"", isText ? u"text" : u"");
      // Some systems make an empty text of none.
      if (isText || type != VT_BSTR) {
        EXPECT_EQ(target.byref == source.byref, !isText);
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

TEST(ComFunctions, VariantsOfOtherTypesAreRefusedAndKept) {
#ifdef _WIN32
  GTEST_SKIP() << "the system knows them";
#endif
  VARIANT odd{}, other{};
  odd.lVal = 77;
  for (const int type : {7, 0x4003}) {
    odd.vt = static_cast<VARTYPE>(type);
    EXPECT_EQ(VariantCopy(&other, &odd), DISP_E_BADVARTYPE);
    EXPECT_EQ(VariantCopy(&odd, &other), DISP_E_BADVARTYPE);
    EXPECT_EQ(VariantClear(&odd), DISP_E_BADVARTYPE);
    EXPECT_EQ(other.vt, VT_EMPTY);
    EXPECT_EQ(odd.lVal, 77);
  }
}

TEST(ComFunctions, ApartmentsNestPerThread) {
  const std::tuple<DWORD, HRESULT, std::uint32_t> rows[] = {{COINIT_MULTITHREADED, E_OUTOFMEMORY, 0},
                                                            {COINIT_APARTMENTTHREADED, S_OK, 1},
                                                            {COINIT_MULTITHREADED, RPC_E_CHANGED_MODE, 1},
                                                            {COINIT_APARTMENTTHREADED, S_FALSE, 2}};
  platform::controls::FailNextCoInitialize(E_OUTOFMEMORY);
  for (const auto& [model, result, depth] : rows) {
    EXPECT_EQ(CoInitializeEx(nullptr, model), result);
    EXPECT_EQ(platform::controls::ApartmentDepth(), depth);
  }
  std::thread([] { EXPECT_EQ(platform::controls::ApartmentDepth(), 0u); }).join();
  for (const std::uint32_t depth : {1u, 0u, 0u}) {
    CoUninitialize();
    EXPECT_EQ(platform::controls::ApartmentDepth(), depth);
  }
  EXPECT_EQ(CoInitializeEx(nullptr, COINIT_MULTITHREADED), S_OK);
  CoUninitialize();
}

}  // namespace
