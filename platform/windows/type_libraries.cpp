#include <algorithm>

#include "platform/com.h"
#include "platform/windows/native_types.h"
#include "platform/windows/windows_module.h"

namespace platform::windows {

namespace {

static_assert(kSYS_WIN32 == SYS_WIN32 && kSYS_WIN64 == SYS_WIN64);

ITypeLib* NativeLibrary(TypeLibraryHandle library) noexcept {
  return reinterpret_cast<ITypeLib*>(library);
}

}  // namespace

HRESULT WindowsTypeLibraries::LoadTypeLib(const char16_t* path,
                                          TypeLibraryHandle& library) noexcept {
  ITypeLib* loaded = nullptr;
  const HRESULT result = ::LoadTypeLib(Native(path), &loaded);
  library = SUCCEEDED(result) ? FromNative(loaded) : kNoTypeLibrary;
  return result;
}

HRESULT WindowsTypeLibraries::GetLibAttr(TypeLibraryHandle library,
                                         TypeLibraryAttributes& attributes) noexcept {
  TLIBATTR* native = nullptr;
  const HRESULT result = NativeLibrary(library)->GetLibAttr(&native);
  if (FAILED(result)) return result;
  attributes = {FromSystemGuid(native->guid), native->lcid,         native->syskind,
                native->wMajorVerNum,         native->wMinorVerNum, native->wLibFlags};
  NativeLibrary(library)->ReleaseTLibAttr(native);
  return result;
}

HRESULT WindowsTypeLibraries::GetHelpFile(TypeLibraryHandle library, char16_t* name,
                                          std::uint32_t nameChars, std::uint32_t& length) noexcept {
  constexpr INT kLibraryItself = -1;
  BSTR file = nullptr;
  const HRESULT result =
      NativeLibrary(library)->GetDocumentation(kLibraryItself, nullptr, nullptr, nullptr, &file);
  if (FAILED(result)) return result;
  const std::u16string_view text = BstrText(file);
  length = static_cast<std::uint32_t>(text.size());
  if (length < nameChars) *std::copy(text.begin(), text.end(), name) = u'\0';
  SysFreeString(file);
  return result;
}

HRESULT WindowsTypeLibraries::RegisterTypeLib(TypeLibraryHandle library, const char16_t* path,
                                              const char16_t* helpDirectory) noexcept {
  // The system takes both texts by pointers that may write, and does not write there.
  return ::RegisterTypeLib(NativeLibrary(library), const_cast<WCHAR*>(Native(path)),
                           const_cast<WCHAR*>(Native(helpDirectory)));
}

HRESULT WindowsTypeLibraries::UnRegisterTypeLib(const Guid& guid, std::uint16_t majorVersion,
                                                std::uint16_t minorVersion, std::uint32_t lcid,
                                                std::int32_t syskind) noexcept {
  return ::UnRegisterTypeLib(*Native(&guid), majorVersion, minorVersion, lcid,
                             static_cast<SYSKIND>(syskind));
}

void WindowsTypeLibraries::ReleaseTypeLib(TypeLibraryHandle library) noexcept {
  NativeLibrary(library)->Release();
}

}  // namespace platform::windows
