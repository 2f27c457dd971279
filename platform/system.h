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

// On Windows the system itself; elsewhere the one that was set last, all null before. Callable from
// every thread.
System CurrentSystem() noexcept;

// Elsewhere than on Windows: what runs behind the seam from now on. Set before the component is
// used and reset after it, when no thread of the component runs.
void SetCurrentSystem(const System& system) noexcept;

}  // namespace platform
