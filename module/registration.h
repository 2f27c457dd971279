// Registering the module, its classes and its type library, and taking all that back.
#pragma once

#include <vector>

#include "module/registry_script.h"
#include "module/server_description.h"
#include "platform/com.h"
#include "platform/module_environment.h"
#include "platform/registry.h"
#include "platform/type_library.h"

namespace KelvoUHW {

// What registration asks of the system. Refers to objects that outlive it.
struct RegistrationSystem {
  platform::Registry& registry;
  platform::TypeLibraries& typeLibraries;
  platform::ModuleEnvironment& environment;
};

// Both work for the whole machine, on the thread of the caller and without a lock, and under the
// system's locale, after which the thread has its own again, also on failure. They return S_OK or
// the first failure: what comes behind it is skipped, what was written stays. Every script is given
// `common` and the module's path besides its own replacements.

// The module's script, then those of the classes in their order, then the type library: that of the
// module's own file, or else of the file beside it whose extension is ".tlb".
HRESULT RegisterServer(const ServerDescription& server, const std::vector<Replacement>& common,
                       const RegistrationSystem& system) noexcept;

// The scripts of the classes, then the type library, then the module's script. A type library that
// is not registered is a failure, so the second of two calls fails.
HRESULT UnregisterServer(const ServerDescription& server, const std::vector<Replacement>& common,
                         const RegistrationSystem& system) noexcept;

}  // namespace KelvoUHW
