// A PC in the system's own ABI: functions that replace, in a module's import table, those of
// SetupAPI, the configuration manager, files, volumes and device notifications. They answer from a
// machine file.
//
// Layouts and codes come from the SDK's headers, or from numbers written beside them, and never
// from platform/. It is stricter than the systems we know: it says so (a *breach*) when a size
// field, an access, a flag or a handle is not exactly what the documentation asks for, leaves a
// mark as the last error after each success, overwrites what a failed call may overwrite and all of
// a buffer that is offered, and answers requests in one uncleared buffer.
//
// One PC in a process. Every function is callable from every thread.
#pragma once

#include <windows.h>

#include <compare>
#include <functional>
#include <map>
#include <string>
#include <vector>

#include "simulation/machine/machine.h"

namespace abi_pc {

using Machine = platform::simulated::Machine;

// Another PC, with nothing open and nothing counted.
void Begin(const Machine& machine);
// The same PC has changed. Handles to a removed device fail from then on.
void Change(const Machine& machine);

// Puts the functions into the module's import table. A function of SetupAPI, the configuration
// manager or volumes that the module imports and that is not known here is a breach.
void Attach(HMODULE module);
// Puts one function there; whether the module imports it.
bool Replace(HMODULE module, const std::string& function, void* with);

// Each kind once, with the call's name.
std::vector<std::string> Breaches();

// What is open now.
struct Open {
  std::size_t files = 0, sets = 0, imageLists = 0, searches = 0, notifications = 0;
  auto operator<=>(const Open&) const = default;
};
Open OpenNow();
std::string TextOf(const Open& open);

// How often each function was called.
std::map<std::string, unsigned> Calls();
// The function that was called last, which may be under way; callable at any moment, in a crash
// too.
const char* LastCall();
// That function fails from that call on (1 is the next) to that call. An empty name takes it back.
void Fail(const std::string& function, unsigned from, unsigned to);
// Is called before each call of any function, with the number of calls before it; empty: no more.
void BeforeCalls(std::function<void(unsigned)> visit);

}  // namespace abi_pc
