// Type libraries, as registering one asks for them: call by call, like the rest of the seam.
//
// What host.h says about its operations holds here too, except that failures are HRESULTs.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "platform/com.h"
#include "platform/guid.h"

namespace platform {

// A loaded library. 0 is none.
using TypeLibraryHandle = std::intptr_t;
inline constexpr TypeLibraryHandle kNoTypeLibrary = 0;

// Kinds of systems a library is made for (SYSKIND).
inline constexpr std::int32_t kSYS_WIN32 = 1;
inline constexpr std::int32_t kSYS_WIN64 = 3;

// The registry could not be read or written (winerror.h).
inline constexpr HRESULT kTYPE_E_REGISTRYACCESS = static_cast<HRESULT>(0x8002801C);

// What TLIBATTR holds.
struct TypeLibraryAttributes {
  Guid guid{};
  std::uint32_t lcid = 0;
  std::int32_t syskind = kSYS_WIN32;
  std::uint16_t wMajorVerNum = 0;
  std::uint16_t wMinorVerNum = 0;
  std::uint16_t wLibFlags = 0;

  friend bool operator==(const TypeLibraryAttributes&, const TypeLibraryAttributes&) = default;
};

// An interface that registering its library makes known to the system, so that calls to it cross
// apartments.
struct LibraryInterface {
  Guid iid{};
  std::u16string name;
  bool dispatch = false;  // a dispinterface; else one marked oleautomation
};

// What a library says of itself as far as registering it is concerned. On Windows a file carries it
// as a resource; elsewhere a program tells it to what stands behind the seam.
struct TypeLibrary {
  TypeLibraryAttributes attributes;
  std::u16string helpString;
  std::u16string helpFile;
  std::vector<LibraryInterface> interfaces;
};

class TypeLibraries {
 public:
  // LoadTypeLib of a full path, a file of its own or a module that carries a library as a resource;
  // nothing is registered. The caller owns `library`; failure leaves kNoTypeLibrary.
  virtual HRESULT LoadTypeLib(const char16_t* path, TypeLibraryHandle& library) noexcept = 0;
  // ITypeLib::GetLibAttr.
  virtual HRESULT GetLibAttr(TypeLibraryHandle library,
                             TypeLibraryAttributes& attributes) noexcept = 0;
  // ITypeLib::GetDocumentation of the library itself, its help file alone. `length` is set to the
  // characters of the name without terminator, 0 when the library names none. The name is written,
  // with its terminator, only where `nameChars` has room for all of it.
  virtual HRESULT GetHelpFile(TypeLibraryHandle library, char16_t* name, std::uint32_t nameChars,
                              std::uint32_t& length) noexcept = 0;
  // RegisterTypeLib: for the whole machine. `helpDirectory` null: the directory of `path`.
  virtual HRESULT RegisterTypeLib(TypeLibraryHandle library, const char16_t* path,
                                  const char16_t* helpDirectory) noexcept = 0;
  // UnRegisterTypeLib. A library that is not registered is an error.
  virtual HRESULT UnRegisterTypeLib(const Guid& guid, std::uint16_t majorVersion,
                                    std::uint16_t minorVersion, std::uint32_t lcid,
                                    std::int32_t syskind) noexcept = 0;
  // IUnknown::Release.
  virtual void ReleaseTypeLib(TypeLibraryHandle library) noexcept = 0;

 protected:
  ~TypeLibraries() = default;
};

}  // namespace platform
