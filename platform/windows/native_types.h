// Between the seam's types and the system's: casts, and the proof that the records are the same.
//
// Included by the files of this folder only.
#pragma once

#include <windows.h>

#include <cfgmgr32.h>
#include <setupapi.h>

#include <cstddef>
#include <cstdint>

#include "platform/host.h"

namespace platform::windows {

inline const WCHAR* Native(const char16_t* text) noexcept {
  return reinterpret_cast<const WCHAR*>(text);
}
inline WCHAR* Native(char16_t* text) noexcept { return reinterpret_cast<WCHAR*>(text); }
static_assert(sizeof(WCHAR) == sizeof(char16_t));

// The system's DWORD and ULONG are 32 bits as well, but a type of their own.
inline DWORD* Native(std::uint32_t* number) noexcept { return reinterpret_cast<DWORD*>(number); }
static_assert(sizeof(DWORD) == sizeof(std::uint32_t) && sizeof(ULONG) == sizeof(std::uint32_t));

inline const GUID* Native(const Guid* guid) noexcept { return reinterpret_cast<const GUID*>(guid); }
static_assert(sizeof(GUID) == sizeof(Guid) && offsetof(GUID, Data4) == offsetof(Guid, Data4));

inline HANDLE Native(std::intptr_t handle) noexcept { return reinterpret_cast<HANDLE>(handle); }
inline std::intptr_t FromNative(HANDLE handle) noexcept {
  return reinterpret_cast<std::intptr_t>(handle);
}

// Of the call that was just made. The system's error is asked for only after a failure: a call that
// succeeds may leave any code behind.
inline Status FromBool(BOOL succeeded) noexcept {
  return succeeded ? Status::Success() : Status::Failure(GetLastError());
}
inline Status FromConfigRet(CONFIGRET result) noexcept {
  return result == CR_SUCCESS ? Status::Success() : Status::Failure(result);
}

// Hands over a handle that a call returned; where it is the invalid one the call has failed.
inline Status TakeHandle(HANDLE returned, std::intptr_t& handle) noexcept {
  handle = FromNative(returned);
  return FromBool(returned != INVALID_HANDLE_VALUE);
}

}  // namespace platform::windows
