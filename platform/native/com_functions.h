// The system's COM functions for builds without the system: what libraries link instead of ole32
// and oleaut32. Callable from every thread.
//
// Public source: the published headers oleauto.h and combaseapi.h.
#pragma once

#include "platform/native/com_interfaces.h"

// A null result means that memory ran out, or that `text` is null (SysAllocString).
BSTR SysAllocString(const char16_t* text) noexcept;
BSTR SysAllocStringLen(const char16_t* text, UINT characters) noexcept;
void SysFreeString(BSTR text) noexcept;  // null is allowed
UINT SysStringLen(BSTR text) noexcept;   // in characters, 0 for null
UINT SysStringByteLen(BSTR text) noexcept;

void VariantInit(VARIANT* variant) noexcept;
// Frees the text or releases the interface that the VARIANT holds.
HRESULT VariantClear(VARIANT* variant) noexcept;
// Clears the target, then copies: E_OUTOFMEMORY leaves it empty. DISP_E_BADVARTYPE for a type that
// VARENUM does not list.
HRESULT VariantCopy(VARIANT* target, const VARIANT* source) noexcept;

// Enters the calling thread into an apartment: S_OK, S_FALSE when it is in one of that kind, or
// RPC_E_CHANGED_MODE. Each success is paired with CoUninitialize on the same thread.
HRESULT CoInitializeEx(void* reserved, DWORD concurrencyModel) noexcept;
void CoUninitialize() noexcept;

// Creates an object of a class: first through the class objects that the process registered itself,
// then through the registry of the current system, by loading the library that InprocServer32 names
// and asking its DllGetClassObject. REGDB_E_CLASSNOTREG, CO_E_DLLNOTFOUND, CO_E_ERRORINDLL, or what
// the class says.
HRESULT CoGetClassObject(REFCLSID clsid, DWORD context, void* reserved, REFIID iid,
                         void** out) noexcept;
HRESULT CoCreateInstance(REFCLSID clsid, IUnknown* outer, DWORD context, REFIID iid,
                         void** out) noexcept;
// A class object of the process's own, referenced until it is revoked.
HRESULT CoRegisterClassObject(REFCLSID clsid, IUnknown* classObject, DWORD context, DWORD flags,
                              DWORD* cookie) noexcept;
HRESULT CoRevokeClassObject(DWORD cookie) noexcept;
// Unloads the libraries that answer DllCanUnloadNow with S_OK and are not being asked for a class
// at that moment. Not while another thread may still be inside the release of a library's last
// object.
void CoFreeUnusedLibraries() noexcept;
// The class of a program identifier such as "KelvoUsbMonitor.UsbTree", from the registry of the
// current system. CO_E_CLASSSTRING when there is none.
HRESULT CLSIDFromProgID(const char16_t* progId, CLSID* clsid) noexcept;
