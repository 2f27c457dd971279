// How builds without the system find the classes of COM.
#include <gtest/gtest.h>

#include "platform/com.h"
#include "platform/system.h"
#include "platform/text.h"
#include "simulation/process/registry.h"
#include "tests/support/registry_lines.h"

namespace {

using testing_support::Put;

constexpr CLSID kClass{0x12345678, 0x9ABC, 0xDEF0, {1, 2, 3, 4, 5, 6, 7, 0xFF}};
const std::u16string kClassText = u"{12345678-9ABC-DEF0-0102-0304050607FF}";
constexpr CLSID kOtherClass{};

// A class object that makes itself.
struct Factory final : IClassFactory {
  HRESULT QueryInterface(REFIID iid, void** out) override {
    const bool known = iid == IUnknown::kIid || iid == IClassFactory::kIid;
    *out = known ? this : nullptr;
    if (known) AddRef();
    return known ? S_OK : E_NOINTERFACE;
  }
  ULONG AddRef() override { return ++references; }
  ULONG Release() override { return --references; }
  HRESULT CreateInstance(IUnknown* outer, REFIID iid, void** out) override {
    return outer != nullptr ? CLASS_E_NOAGGREGATION : QueryInterface(iid, out);
  }
  HRESULT LockServer(BOOL) override { return E_NOTIMPL; }
  ULONG references = 1;
};

// What COM answers for a class object and for an object, which has to be the same; `out` is checked, too.
HRESULT Ask(const CLSID& clsid, const IID& iid, IUnknown* expected = nullptr, IUnknown* outer = nullptr) {
  HRESULT results[2] = {};
  for (const bool object : {false, true}) {
    void* out = &results;
    results[object] = object ? CoCreateInstance(clsid, outer, CLSCTX_INPROC_SERVER, iid, &out)
                             : CoGetClassObject(clsid, CLSCTX_INPROC_SERVER, nullptr, iid, &out);
    EXPECT_EQ(out, SUCCEEDED(results[object]) ? expected : nullptr);
    if (SUCCEEDED(results[object])) static_cast<IUnknown*>(out)->Release();
  }
  // Aggregation is an object's business.
  EXPECT_TRUE(outer != nullptr || results[0] == results[1]);
  return results[1];
}

TEST(ClassObjects, OfTheProcessComeBeforeThoseOfTheRegistry) {
  platform::simulated::SimulatedRegistry registry;
  platform::SetCurrentSystem({.registry = &registry});
  Put(registry, u"CLSID\\" + kClassText + u"\\InprocServer32", u"", u"/nowhere/server.so");
  Factory first, second;
  DWORD firstCookie = 0, secondCookie = 0;
  EXPECT_EQ(CoRegisterClassObject(kClass, nullptr, CLSCTX_INPROC_SERVER, 0, &firstCookie), E_INVALIDARG);
  EXPECT_EQ(CoRegisterClassObject(kClass, &first, CLSCTX_INPROC_SERVER, 0, nullptr), E_INVALIDARG);
  EXPECT_EQ(CoGetClassObject(kClass, CLSCTX_INPROC_SERVER, nullptr, IUnknown::kIid, nullptr), E_POINTER);
  EXPECT_EQ(CoCreateInstance(kClass, nullptr, CLSCTX_INPROC_SERVER, IUnknown::kIid, nullptr), E_POINTER);
  ASSERT_EQ(CoRegisterClassObject(kClass, &first, CLSCTX_INPROC_SERVER, 0, &firstCookie), S_OK);
  ASSERT_EQ(CoRegisterClassObject(kClass, &second, CLSCTX_INPROC_SERVER, 0, &secondCookie), S_OK);
  EXPECT_NE(firstCookie, secondCookie);
  EXPECT_EQ(Ask(kClass, IClassFactory::kIid, &first), S_OK);
  EXPECT_EQ(Ask(kClass, IDispatch::kIid), E_NOINTERFACE);
  EXPECT_EQ(Ask(kClass, IUnknown::kIid, &first, &second), CLASS_E_NOAGGREGATION);
  EXPECT_EQ(Ask(kOtherClass, IUnknown::kIid), REGDB_E_CLASSNOTREG);
  EXPECT_EQ(first.references, 2u);
  EXPECT_EQ(CoRevokeClassObject(firstCookie), S_OK);
  EXPECT_EQ(CoRevokeClassObject(firstCookie), E_INVALIDARG);
  EXPECT_EQ(first.references, 1u);
  EXPECT_EQ(Ask(kClass, IUnknown::kIid, &second), S_OK);
  EXPECT_EQ(CoRevokeClassObject(secondCookie), S_OK);
  EXPECT_EQ(Ask(kClass, IUnknown::kIid), CO_E_DLLNOTFOUND);
  platform::SetCurrentSystem({});
}

TEST(ClassObjects, OfTheRegistryAreLookedUpStepByStep) {
  const std::u16string key = u"CLSID\\" + kClassText;
  // A library that is no server: the platform layer itself.
  const std::u16string noServer = platform::FromUtf8(ZKUSB_PLATFORM_LIBRARY);
  const std::u16string server = key + u"\\InprocServer32";
  const std::tuple<const char*, std::u16string, const char16_t*, std::u16string, HRESULT> kCases[] = {
      {"no key", u"CLSID", nullptr, u"", REGDB_E_CLASSNOTREG},
      {"no server", key, u"", noServer, REGDB_E_CLASSNOTREG},
      {"no path", server, nullptr, u"", REGDB_E_CLASSNOTREG},
      {"an empty path", server, u"", u"", REGDB_E_CLASSNOTREG},
      {"no library", server, u"", u"/dev/null", CO_E_DLLNOTFOUND},
      {"a library that is no server", server, u"", noServer, CO_E_ERRORINDLL}};
  platform::SetCurrentSystem({});
  EXPECT_EQ(Ask(kClass, IUnknown::kIid), REGDB_E_CLASSNOTREG) << "no registry";
  for (const auto& [what, key, name, text, result] : kCases) {
    SCOPED_TRACE(what);
    platform::simulated::SimulatedRegistry registry;
    platform::SetCurrentSystem({.registry = &registry});
    Put(registry, key, name, text);
    EXPECT_EQ(Ask(kClass, IUnknown::kIid), result);
    CoFreeUnusedLibraries();
    testing_support::ExpectAllClosed(registry);
  }
  platform::SetCurrentSystem({});
}

TEST(ClassObjects, AreNamedByProgramIdentifiers) {
  const std::u16string& text = kClassText;
  const std::tuple<const char16_t*, std::u16string, HRESULT> kCases[] = {
      {u"Server.1", text, S_OK},
      {u"SERVER.1", u"{12345678-9abc-def0-0102-0304050607ff}", S_OK},
      {u"Server", text, CO_E_CLASSSTRING},
      {u"", text, CO_E_CLASSSTRING},
      {u"Server.1", u"", CO_E_CLASSSTRING},
      {u"Server.1", text.substr(1, 36), CO_E_CLASSSTRING},
      {u"Server.1", u"(" + text.substr(1), CO_E_CLASSSTRING},
      {u"Server.1", text + u" ", CO_E_CLASSSTRING},
      {u"Server.1", u"{1234567G-9ABC-DEF0-0102-0304050607FF}", CO_E_CLASSSTRING},
      {u"Server.1", u"{+2345678-9ABC-DEF0-0102-0304050607FF}", CO_E_CLASSSTRING},
      {u"Server.1", u"{12345678-9ABC-DEF0-01020-304050607FF}", CO_E_CLASSSTRING}};
  CLSID clsid{};
  // The text is what the registry has for Server.1.
  for (const auto& [progId, text, result] : kCases) {
    SCOPED_TRACE(platform::ToUtf8(progId + (u" " + text)));
    platform::simulated::SimulatedRegistry registry;
    platform::SetCurrentSystem({.registry = &registry});
    Put(registry, u"Server.1\\CLSID", u"", text);
    clsid = {1, 2, 3, {}};
    EXPECT_EQ(CLSIDFromProgID(progId, &clsid), result);
    EXPECT_EQ(clsid, result == S_OK ? kClass : GUID_NULL);
    const auto parsed = platform::ParseGuid(text);
    EXPECT_EQ(parsed.has_value(), platform::EqualIgnoringCase(text, kClassText));
    EXPECT_EQ(parsed.value_or(kClass), kClass);
  }
  platform::SetCurrentSystem({});
  EXPECT_EQ(CLSIDFromProgID(nullptr, &clsid), E_INVALIDARG);
  EXPECT_EQ(CLSIDFromProgID(u"Server.1", nullptr), E_INVALIDARG);
  EXPECT_EQ(CLSIDFromProgID(u"Server.1", &clsid), CO_E_CLASSSTRING) << "no registry";
}

}  // namespace
