// Type libraries of a simulated PC: which files carry one, and what registering one writes.
#pragma once

#include <cstdint>
#include <map>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

#include "platform/registry.h"
#include "platform/type_library.h"

namespace platform::simulated {

// Writes to the registry it is given, with its own keys closed again after each call. Paths compare
// without case. Thread-safe.
class SimulatedTypeLibraries final : public TypeLibraries {
 public:
  explicit SimulatedTypeLibraries(Registry& registry);

  // From now on the file of that path carries the library.
  void Add(std::u16string_view path, TypeLibrary library);

  // TYPE_E_CANTLOADLIBRARY for a file without library.
  HRESULT LoadTypeLib(const char16_t* path, TypeLibraryHandle& library) noexcept override;
  HRESULT GetLibAttr(TypeLibraryHandle library,
                     TypeLibraryAttributes& attributes) noexcept override;
  HRESULT GetHelpFile(TypeLibraryHandle library, char16_t* name, std::uint32_t nameChars,
                      std::uint32_t& length) noexcept override;
  // Both report whatever fails in the registry as TYPE_E_REGISTRYACCESS, as the system does, and
  // leave what was done until then.
  HRESULT RegisterTypeLib(TypeLibraryHandle library, const char16_t* path,
                          const char16_t* helpDirectory) noexcept override;
  HRESULT UnRegisterTypeLib(const Guid& guid, std::uint16_t majorVersion,
                            std::uint16_t minorVersion, std::uint32_t lcid,
                            std::int32_t syskind) noexcept override;
  void ReleaseTypeLib(TypeLibraryHandle library) noexcept override;

  std::size_t LoadedCount() const;
  // Releases of what was not loaded.
  std::size_t MisuseCount() const;

 private:
  const TypeLibrary* Find(TypeLibraryHandle library) const;

  Registry& m_registry;
  mutable std::mutex m_mutex;
  std::map<std::u16string, TypeLibrary> m_files;  // by path in upper case
  TypeLibraryHandle m_nextHandle;
  std::map<TypeLibraryHandle, TypeLibrary> m_loaded;
  std::size_t m_misuses = 0;
};

}  // namespace platform::simulated
