// The plain types of COM for builds without the system's headers: names, sizes, layouts and values
// are those that the system publishes, so that interfaces have one shape in every build. Types that
// are called long are 32 bits wide everywhere.
//
// Public source: the published headers wtypes.h, winerror.h, oaidl.h and ocidl.h.
#pragma once

#include <cstdint>

#include "platform/guid.h"

#define STDMETHODCALLTYPE
#define STDAPICALLTYPE

using BYTE = std::uint8_t;
using WORD = std::uint16_t;
using DWORD = std::uint32_t;
using SHORT = std::int16_t;
using LONG = std::int32_t;
using ULONG = std::uint32_t;
using UINT = std::uint32_t;
using BOOL = std::int32_t;
using HRESULT = std::int32_t;
using LCID = std::uint32_t;
using DISPID = std::int32_t;
using VARTYPE = std::uint16_t;
using VARIANT_BOOL = std::int16_t;
using OLECHAR = char16_t;
using LPOLESTR = char16_t*;
using LPCOLESTR = const char16_t*;
// Points at the first character; the length in bytes stands in the four bytes before it, a zero
// character behind it. Null is an empty text.
using BSTR = char16_t*;

using GUID = platform::Guid;
using IID = GUID;
using CLSID = GUID;
using REFIID = const IID&;
using REFCLSID = const CLSID&;
using REFGUID = const GUID&;
inline constexpr GUID GUID_NULL{};
inline constexpr IID IID_NULL{};

namespace platform::native {
constexpr HRESULT ToHresult(std::uint32_t code) noexcept { return static_cast<HRESULT>(code); }
}  // namespace platform::native

inline constexpr HRESULT S_OK = 0;
inline constexpr HRESULT S_FALSE = 1;
inline constexpr HRESULT E_NOTIMPL = platform::native::ToHresult(0x80004001);
inline constexpr HRESULT E_NOINTERFACE = platform::native::ToHresult(0x80004002);
inline constexpr HRESULT E_POINTER = platform::native::ToHresult(0x80004003);
inline constexpr HRESULT E_ABORT = platform::native::ToHresult(0x80004004);
inline constexpr HRESULT E_FAIL = platform::native::ToHresult(0x80004005);
inline constexpr HRESULT E_UNEXPECTED = platform::native::ToHresult(0x8000FFFF);
inline constexpr HRESULT E_ACCESSDENIED = platform::native::ToHresult(0x80070005);
inline constexpr HRESULT E_OUTOFMEMORY = platform::native::ToHresult(0x8007000E);
inline constexpr HRESULT E_INVALIDARG = platform::native::ToHresult(0x80070057);
inline constexpr HRESULT DISP_E_BADVARTYPE = platform::native::ToHresult(0x80020008);
inline constexpr HRESULT DISP_E_MEMBERNOTFOUND = platform::native::ToHresult(0x80020003);
inline constexpr HRESULT DISP_E_UNKNOWNNAME = platform::native::ToHresult(0x80020006);
inline constexpr HRESULT DISP_E_EXCEPTION = platform::native::ToHresult(0x80020009);
inline constexpr HRESULT DISP_E_TYPEMISMATCH = platform::native::ToHresult(0x80020005);
inline constexpr HRESULT DISP_E_BADPARAMCOUNT = platform::native::ToHresult(0x8002000E);
inline constexpr HRESULT TYPE_E_CANTLOADLIBRARY = platform::native::ToHresult(0x80029C4A);
inline constexpr HRESULT CLASS_E_NOAGGREGATION = platform::native::ToHresult(0x80040110);
inline constexpr HRESULT CLASS_E_CLASSNOTAVAILABLE = platform::native::ToHresult(0x80040111);
inline constexpr HRESULT REGDB_E_CLASSNOTREG = platform::native::ToHresult(0x80040154);
inline constexpr HRESULT CO_E_NOTINITIALIZED = platform::native::ToHresult(0x800401F0);
inline constexpr HRESULT CO_E_CLASSSTRING = platform::native::ToHresult(0x800401F3);
inline constexpr HRESULT CO_E_DLLNOTFOUND = platform::native::ToHresult(0x800401F8);
inline constexpr HRESULT CO_E_ERRORINDLL = platform::native::ToHresult(0x800401F9);
inline constexpr HRESULT CONNECT_E_NOCONNECTION = platform::native::ToHresult(0x80040200);
inline constexpr HRESULT CONNECT_E_ADVISELIMIT = platform::native::ToHresult(0x80040201);
inline constexpr HRESULT CONNECT_E_CANNOTCONNECT = platform::native::ToHresult(0x80040202);
inline constexpr HRESULT RPC_E_CHANGED_MODE = platform::native::ToHresult(0x80010106);

constexpr bool SUCCEEDED(HRESULT result) noexcept { return result >= 0; }
constexpr bool FAILED(HRESULT result) noexcept { return result < 0; }
constexpr HRESULT HRESULT_FROM_WIN32(std::uint32_t error) noexcept {
  return static_cast<std::int32_t>(error) <= 0
             ? static_cast<HRESULT>(error)
             : platform::native::ToHresult((error & 0xFFFF) | 0x80070000);
}

inline constexpr BOOL TRUE = 1;
inline constexpr BOOL FALSE = 0;
inline constexpr VARIANT_BOOL VARIANT_TRUE = -1;
inline constexpr VARIANT_BOOL VARIANT_FALSE = 0;

inline constexpr DWORD COINIT_MULTITHREADED = 0;
inline constexpr DWORD COINIT_APARTMENTTHREADED = 2;
inline constexpr DWORD CLSCTX_INPROC_SERVER = 1;
inline constexpr DWORD REGCLS_MULTIPLEUSE = 1;
inline constexpr WORD DISPATCH_METHOD = 1;
inline constexpr LCID LOCALE_USER_DEFAULT = 0x400;
inline constexpr LCID LOCALE_SYSTEM_DEFAULT = 0x800;

enum VARENUM : VARTYPE {
  VT_EMPTY = 0,
  VT_I2 = 2,
  VT_I4 = 3,
  VT_BSTR = 8,
  VT_DISPATCH = 9,
  VT_BOOL = 11,
  VT_UNKNOWN = 13,
  VT_UI1 = 17,
  VT_UI4 = 19,
};

struct IUnknown;
struct IDispatch;
struct ITypeInfo;

// 16 bytes with 32-bit pointers, 24 with 64-bit ones.
struct VARIANT {
  struct Record {
    void* pvRecord;
    void* pRecInfo;
  };

  VARTYPE vt;
  WORD wReserved1;
  WORD wReserved2;
  WORD wReserved3;
  union {
    LONG lVal;
    ULONG ulVal;
    SHORT iVal;
    BYTE bVal;
    VARIANT_BOOL boolVal;
    double dblVal;
    BSTR bstrVal;
    IUnknown* punkVal;
    IDispatch* pdispVal;
    void* byref;
    Record record;
  };
};
using VARIANTARG = VARIANT;
static_assert(sizeof(VARIANT) == 8 + 2 * sizeof(void*));

struct DISPPARAMS {
  VARIANTARG* rgvarg;  // the last argument first
  DISPID* rgdispidNamedArgs;
  UINT cArgs;
  UINT cNamedArgs;
};

struct EXCEPINFO {
  WORD wCode;
  WORD wReserved;
  BSTR bstrSource;
  BSTR bstrDescription;
  BSTR bstrHelpFile;
  DWORD dwHelpContext;
  void* pvReserved;
  HRESULT(STDMETHODCALLTYPE* pfnDeferredFillIn)(EXCEPINFO*);
  HRESULT scode;
};

struct CONNECTDATA {
  IUnknown* pUnk;
  DWORD dwCookie;
};
