// What the functions of the PC share; only they include this.
#pragma once

#include <windows.h>

#include <cfgmgr32.h>
#include <setupapi.h>

#include <atomic>
#include <cstdint>
#include <cstring>
#include <memory>
#include <mutex>
#include <optional>
#include <set>
#include <variant>

#include "simulation/abi/abi_pc.h"
#include "simulation/machine/machine_index.h"

namespace abi_pc {

namespace sim = platform::simulated;
using Index = sim::MachineIndex;
using Position = Index::Position;
inline constexpr Position kNone = Index::kNone;

// What programs find as the last error after a call that did not fail.
inline constexpr DWORD kMark = 0xA5A50001;
inline constexpr unsigned char kGarbage = 0xA5;
// More than the largest PC of the tests takes. From there on everything fails, which ends every
// search.
inline constexpr unsigned kMostCalls = 2'000'000;
// Where the handles of this PC begin; the system's own are smaller.
inline constexpr std::uintptr_t kFirstHandle = 0x5A000000;

// The machine as it is now, and the tables to look it up in.
struct Now {
  Now(Machine now, sim::DeviceNumbers& numbers)
      : machine(std::move(now)), index(machine, numbers) {}
  const Machine machine;
  const Index index;
};

enum class FileKind { Controller, Hub, Storage };
struct File {
  FileKind kind;
  std::u16string name;  // lowered
  DWORD access;
  bool gone = false;
};
struct Set {
  std::shared_ptr<const sim::SetContents> contents;
};
struct Images {};
struct Search {
  bool volumes;  // else mount points
  std::vector<std::u16string> names;
  std::size_t next = 0;
};
struct Notification {};
using Object = std::variant<File, Set, Images, Search, Notification>;

struct State {
  std::recursive_mutex mutex;
  sim::DeviceNumbers numbers;
  std::unique_ptr<const Now> now;
  std::map<std::uintptr_t, Object> open;
  std::uintptr_t lastHandle = kFirstHandle;  // none is given twice
  std::set<std::string> breaches;
  std::map<std::string, unsigned> calls;
  unsigned allCalls = 0;
  std::atomic<const char*> lastCall = "no call";
  std::string failing;
  unsigned failFrom = 0, failTo = 0;
  std::function<void(unsigned)> before;
};
State& Pc();

// One call of a function: holds the PC, counts, and says whether it is to fail.
class Call {
 public:
  explicit Call(const char* function);
  bool Fails() const { return m_fails; }
  void Breach(const std::string& what) const {
    m_pc.breaches.insert(std::string(m_function) + ": " + what);
  }
  // Says so unless it holds.
  bool Want(bool holds, const std::string& what) const {
    if (!holds) Breach(what);
    return holds;
  }
  BOOL Done() const { return SetLastError(kMark), TRUE; }
  BOOL Refuse(DWORD code) const { return SetLastError(code), FALSE; }
  // What was asked for is not as documented, which the system would answer with that code.
  BOOL Misused(DWORD code, const std::string& what) const { return Breach(what), Refuse(code); }
  // Overwrites all that is offered, which the caller therefore must own. How long a block of the
  // heap is, is known; more is a breach and stays as it is. Beyond a buffer on the stack the
  // program crashes.
  void SpoilBytes(void* buffer, std::size_t bytes) const;

  State& Pc() const { return m_pc; }
  const Now& Machine() const { return *m_pc.now; }
  HANDLE Opened(Object object) const;
  // The open object of that kind; otherwise a breach and null.
  template <class Kind>
  Kind* Find(HANDLE handle) const {
    const auto found = m_pc.open.find(reinterpret_cast<std::uintptr_t>(handle));
    Kind* const object = found == m_pc.open.end() ? nullptr : std::get_if<Kind>(&found->second);
    Want(object != nullptr, "a handle that is not open, or of another kind");
    return object;
  }
  template <class Kind>
  BOOL Close(HANDLE handle) const {
    if (Find<Kind>(handle) == nullptr) return Refuse(ERROR_INVALID_HANDLE);
    m_pc.open.erase(reinterpret_cast<std::uintptr_t>(handle));
    // One that is to fail has closed nevertheless: what else could the program do?
    return Fails() ? Refuse(ERROR_GEN_FAILURE) : Done();
  }

 private:
  State& m_pc;
  const std::lock_guard<std::recursive_mutex> m_lock;
  const char* const m_function;
  bool m_fails = false;
};

template <class... Value>
void Spoil(Value*... values) {
  ((values != nullptr ? static_cast<void>(std::memset(values, kGarbage, sizeof *values)) : void()),
   ...);
}
inline const char16_t* Units(const wchar_t* text) {
  return reinterpret_cast<const char16_t*>(text);
}
inline const platform::Guid& AsKey(const GUID& guid) {
  return reinterpret_cast<const platform::Guid&>(guid);
}
std::u16string Lowered(std::u16string_view text);

// A text and its zero into a buffer counted in characters; false, with the buffer as it was, where
// it does not fit.
bool GiveText(std::u16string_view text, wchar_t* buffer, std::size_t chars);
// The bytes of a registry property and its type; nothing where the device has none of that number.
std::optional<std::pair<DWORD, std::string>> PropertyOf(const sim::Device& device, DWORD property);

// The functions of one file each, by name.
using Functions = std::map<std::string, void*>;
Functions SetupFunctions();
Functions NodeFunctions();
Functions FileFunctions();
Functions VolumeFunctions();
Functions NotificationFunctions();

template <class Function>
void* Address(Function* function) {
  return reinterpret_cast<void*>(function);
}

}  // namespace abi_pc
