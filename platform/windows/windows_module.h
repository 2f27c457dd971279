// The system's registry and type libraries, and the component's own module, behind the seam.
//
// Each operation is the system's call of the same meaning and nothing more. The objects hold no
// state, and serve any number of threads.
#pragma once

#include "platform/module_environment.h"
#include "platform/registry.h"
#include "platform/type_library.h"

namespace platform::windows {

class WindowsRegistry final : public Registry {
 public:
  Status CreateKey(RegistryKeyHandle parent, const char16_t* path, std::uint32_t access,
                   RegistryKeyHandle& key, std::uint32_t& disposition) noexcept override;
  Status OpenKey(RegistryKeyHandle parent, const char16_t* path, std::uint32_t access,
                 RegistryKeyHandle& key) noexcept override;
  Status SetValue(RegistryKeyHandle key, const char16_t* name, std::uint32_t type, const void* data,
                  std::uint32_t dataBytes) noexcept override;
  Status QueryValue(RegistryKeyHandle key, const char16_t* name, std::uint32_t* type, void* data,
                    std::uint32_t& dataBytes) noexcept override;
  Status EnumKey(RegistryKeyHandle key, std::uint32_t index, char16_t* name,
                 std::uint32_t& nameChars) noexcept override;
  Status DeleteKey(RegistryKeyHandle parent, const char16_t* path) noexcept override;
  Status DeleteValue(RegistryKeyHandle key, const char16_t* name) noexcept override;
  Status CloseKey(RegistryKeyHandle key) noexcept override;
};

class WindowsTypeLibraries final : public TypeLibraries {
 public:
  HRESULT LoadTypeLib(const char16_t* path, TypeLibraryHandle& library) noexcept override;
  HRESULT GetLibAttr(TypeLibraryHandle library,
                     TypeLibraryAttributes& attributes) noexcept override;
  HRESULT GetHelpFile(TypeLibraryHandle library, char16_t* name, std::uint32_t nameChars,
                      std::uint32_t& length) noexcept override;
  HRESULT RegisterTypeLib(TypeLibraryHandle library, const char16_t* path,
                          const char16_t* helpDirectory) noexcept override;
  HRESULT UnRegisterTypeLib(const Guid& guid, std::uint16_t majorVersion,
                            std::uint16_t minorVersion, std::uint32_t lcid,
                            std::int32_t syskind) noexcept override;
  void ReleaseTypeLib(TypeLibraryHandle library) noexcept override;
};

class WindowsModuleEnvironment final : public ModuleEnvironment {
 public:
  Status ModuleFileName(char16_t* path, std::uint32_t pathChars,
                        std::uint32_t& length) noexcept override;
  std::uint32_t ThreadLocale() noexcept override;
  Status SetThreadLocale(std::uint32_t locale) noexcept override;
};

}  // namespace platform::windows
