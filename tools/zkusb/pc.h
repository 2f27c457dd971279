// The PC that a run looks at. Each build links one of two: simulated_pc.cpp, or windows_pc.cpp.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace zkusb {

// Where the component runs: its classes can be created while a Pc lives. One at a time, by one
// thread.
//
// Elsewhere than on Windows this is a simulated PC, with a process of its own and a registry of its
// own in which the component is registered, on virtual time: what takes seconds there takes no time
// here.
//
// On Windows it is the PC that the program runs on, in real time; the component's file beside the
// program serves its classes to this process alone. With a machine file or a script that file is
// ZKUsbMonitorSimulated.dll, which plays the script by itself.
class Pc {
 public:
  struct Step {
    std::uint32_t atMilliseconds = 0;  // since the script's start
    std::u16string name;               // for people; may be empty
  };

  // Loads the files; an empty machine file stands for the built-in machine, an empty script file
  // for a script without steps. Throws std::runtime_error, with the file's name where a file is
  // wrong.
  Pc(const std::string& machineFile, const std::string& scriptFile);
  ~Pc();
  Pc(const Pc&) = delete;
  Pc& operator=(const Pc&) = delete;

  const std::vector<Step>& Steps() const noexcept { return m_steps; }
  // The steps change the PC and nobody is told. Throws std::runtime_error for one that the PC
  // refuses, and where a script plays in real time.
  void ApplyAll();
  // Waits for the step's moment, changes the PC, and sends the process what the system would. What
  // that sets off has run, as far as it goes without waiting, when this returns; in real time, as
  // far as it comes within half a second.
  void Play(std::size_t step);
  // In real time, Ctrl-C ends it where platform::CatchInterrupts was called.
  void WaitFor(std::uint32_t milliseconds);
  // Until all that was set off has come to its end.
  void Settle();
  std::uint64_t Now() const;  // in milliseconds, since the start

  // What stands in the registry below the component's keys, a line for each key and value.
  std::vector<std::u16string> RegistryLines() const;
  // Registers the component for the whole machine. Throws std::runtime_error.
  void Register();
  // Takes the registration back. Throws std::runtime_error.
  void Unregister();

 private:
  struct State;
  std::unique_ptr<State> m_state;
  std::vector<Step> m_steps;
};

}  // namespace zkusb
