// The system that this process runs on: the seam's interfaces, gathered.
#pragma once

namespace platform {

class Desktop;
class Host;
class ModuleEnvironment;
class Registry;
class Threads;
class TypeLibraries;

// None is null in a process that uses the whole component; a test may leave out what it does not
// need. None is owned.
struct System {
  Host* host = nullptr;
  Threads* threads = nullptr;
  Desktop* desktop = nullptr;
  Registry* registry = nullptr;
  TypeLibraries* typeLibraries = nullptr;
  ModuleEnvironment* environment = nullptr;
};

// The one that was set last; where none is set, on Windows the system itself, elsewhere all null.
// Callable from every thread.
System CurrentSystem() noexcept;

// What runs behind the seam from now on; all null resets it. Set before the component is used and
// reset after it, when no thread of the component runs.
void SetCurrentSystem(const System& system) noexcept;

}  // namespace platform
