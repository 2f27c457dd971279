// A stand-in for the system's header, for a compiler in its Microsoft mode without the system's own: there a type's
// uuid is an attribute, and __uuidof an operator. It has what the headers under test name, and nothing else.
#pragma once

typedef long HRESULT;
typedef long LONG;
typedef unsigned long ULONG;
typedef unsigned long DWORD;
typedef unsigned char BYTE;
typedef wchar_t* BSTR;
typedef short VARIANT_BOOL;
struct _GUID {
  unsigned long Data1;
  unsigned short Data2, Data3;
  unsigned char Data4[8];
};
typedef _GUID GUID;
typedef GUID CLSID;
typedef GUID IID;

#define STDMETHODCALLTYPE __stdcall
#define DECLSPEC_SELECTANY __declspec(selectany)
#define DECLSPEC_UUID(text) __declspec(uuid(text))
#define MIDL_INTERFACE(text) struct __declspec(uuid(text)) __declspec(novtable)
#define CLSCTX_INPROC_SERVER 1
#define E_POINTER static_cast<HRESULT>(0x80004003)
#define FAILED(code) ((code) < 0)
#define IID_PPV_ARGS(pointer) __uuidof(**(pointer)), reinterpret_cast<void**>(pointer)

MIDL_INTERFACE("00000000-0000-0000-C000-000000000046") IUnknown {
  virtual HRESULT STDMETHODCALLTYPE QueryInterface(const IID& iid, void** object) = 0;
  virtual ULONG STDMETHODCALLTYPE AddRef() = 0;
  virtual ULONG STDMETHODCALLTYPE Release() = 0;
};
struct IEnumVARIANT;

bool IsEqualGUID(const GUID& left, const GUID& right);
extern "C" HRESULT __stdcall CoCreateInstance(const CLSID&, IUnknown*, DWORD, const IID&, void**);
