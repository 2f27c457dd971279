// The COM ABI: the system's own headers on Windows, our definitions of the same types and functions
// everywhere else; and the casts between its character type and ours.
#pragma once

#ifdef _WIN32
#ifndef NOMINMAX
#define NOMINMAX
#endif
#ifndef WIN32_LEAN_AND_MEAN
#define WIN32_LEAN_AND_MEAN
#endif
#include <windows.h>
// Behind windows.h, on which they build.
#include <objbase.h>
#include <ocidl.h>
#include <oleauto.h>
#include <olectl.h>
#else
#include "platform/native/com_functions.h"
#include "platform/native/com_interfaces.h"
#include "platform/native/com_types.h"
#endif

#include <bit>
#include <cstdint>
#include <string_view>

#include "platform/guid.h"

namespace platform {

#ifdef _WIN32
inline const char16_t* FromSystemText(const wchar_t* text) noexcept {
  return reinterpret_cast<const char16_t*>(text);
}
inline const wchar_t* ToSystemText(const char16_t* text) noexcept {
  return reinterpret_cast<const wchar_t*>(text);
}
inline wchar_t* ToSystemText(char16_t* text) noexcept { return reinterpret_cast<wchar_t*>(text); }
inline GUID ToSystemGuid(const Guid& guid) noexcept { return std::bit_cast<GUID>(guid); }
inline Guid FromSystemGuid(const GUID& guid) noexcept { return std::bit_cast<Guid>(guid); }
#else
inline const char16_t* FromSystemText(const char16_t* text) noexcept { return text; }
inline const char16_t* ToSystemText(const char16_t* text) noexcept { return text; }
inline char16_t* ToSystemText(char16_t* text) noexcept { return text; }
inline GUID ToSystemGuid(const Guid& guid) noexcept { return guid; }
inline Guid FromSystemGuid(const GUID& guid) noexcept { return guid; }
#endif

// A new text of its own for the caller, who frees it with SysFreeString; null when memory ran out.
inline BSTR MakeBstr(std::u16string_view text) noexcept {
  // Never null, so that an empty text is an empty BSTR; a view without characters may be.
  const char16_t* start = text.data() ? text.data() : u"";
  return SysAllocStringLen(ToSystemText(start), static_cast<UINT>(text.size()));
}

// The characters of a BSTR; empty for null. Valid as long as the BSTR is.
inline std::u16string_view BstrText(BSTR text) noexcept {
  return text ? std::u16string_view(FromSystemText(text), SysStringLen(text))
              : std::u16string_view();
}

// The identifier of an interface, ours or the system's.
template <class Interface>
const IID& IidOf() noexcept {
  if constexpr (requires { Interface::kIid; }) {
    return Interface::kIid;
  } else {
#ifdef _WIN32
    return __uuidof(Interface);
#endif
  }
}

}  // namespace platform
