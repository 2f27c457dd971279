#include "simulation/abi/state.h"

#include <malloc.h>
#include <sstream>

#include "platform/text.h"

namespace abi_pc {

State& Pc() {
  static State* const s_state = new State;  // outlives every thread
  return *s_state;
}

Call::Call(const char* function) : m_pc(abi_pc::Pc()), m_lock(m_pc.mutex), m_function(function) {
  if (const auto before = m_pc.before) before(m_pc.allCalls);
  m_pc.lastCall = function;
  if (++m_pc.allCalls == kMostCalls) Breach("a search that does not end");
  const unsigned nth = ++m_pc.calls[function];
  m_fails = m_pc.allCalls >= kMostCalls ||
            (m_pc.failing == function && nth >= m_pc.failFrom && nth <= m_pc.failTo);
}

HANDLE Call::Opened(Object object) const {
  const std::uintptr_t handle = m_pc.lastHandle += 4;
  m_pc.open.emplace(handle, std::move(object));
  SetLastError(kMark);
  return reinterpret_cast<HANDLE>(handle);
}

void Call::SpoilBytes(void* buffer, std::size_t bytes) const {
  if (buffer == nullptr) return;
  const auto heap = reinterpret_cast<HANDLE>(_get_heap_handle());  // what malloc takes from
  if (HeapValidate(heap, 0, buffer)) {
    const std::size_t owned = HeapSize(heap, 0, buffer);
    if (!Want(bytes <= owned, "more is offered than the buffer has")) bytes = owned;
  }
  std::memset(buffer, kGarbage, bytes);
}

std::u16string Lowered(std::u16string_view text) { return platform::ToLower(text); }

bool GiveText(std::u16string_view text, wchar_t* buffer, std::size_t chars) {
  if (buffer == nullptr || text.size() >= chars) return false;
  std::memcpy(buffer, text.data(), text.size() * sizeof(wchar_t));
  buffer[text.size()] = 0;
  return true;
}

void Begin(const Machine& machine) {
  State& pc = Pc();
  const std::lock_guard lock(pc.mutex);
  pc.numbers = {};
  pc.now = std::make_unique<Now>(machine, pc.numbers);
  pc.open.clear();
  pc.breaches.clear();
  pc.calls.clear();
  pc.allCalls = 0;
  pc.failing.clear();
  pc.before = nullptr;
}

void Change(const Machine& machine) {
  State& pc = Pc();
  const std::lock_guard lock(pc.mutex);
  auto now = std::make_unique<Now>(machine, pc.numbers);
  for (auto& [handle, object] : pc.open) {
    auto* const file = std::get_if<File>(&object);
    if (file == nullptr) continue;
    const Index& index = now->index;
    const Position found = file->kind == FileKind::Controller ? index.Controller(file->name)
                           : file->kind == FileKind::Hub      ? index.Hub(file->name)
                           : sim::IsDriveName(file->name)     ? index.Drive(file->name[4])
                                                              : index.Interface(file->name);
    if (found == kNone) file->gone = true;
  }
  pc.now = std::move(now);
}

std::vector<std::string> Breaches() {
  const std::lock_guard lock(Pc().mutex);
  return {Pc().breaches.begin(), Pc().breaches.end()};
}

Open OpenNow() {
  const std::lock_guard lock(Pc().mutex);
  Open open;
  std::size_t* const kinds[] = {&open.files, &open.sets, &open.imageLists, &open.searches,
                                &open.notifications};
  for (const auto& entry : Pc().open) ++*kinds[entry.second.index()];
  return open;
}

std::string TextOf(const Open& open) {
  std::ostringstream text;
  text << open.files << " files, " << open.sets << " sets, " << open.imageLists << " image lists, "
       << open.searches << " searches, " << open.notifications << " notifications";
  return text.str();
}

const char* LastCall() { return Pc().lastCall; }

std::map<std::string, unsigned> Calls() {
  const std::lock_guard lock(Pc().mutex);
  return Pc().calls;
}

void Fail(const std::string& function, unsigned from, unsigned to) {
  const std::lock_guard lock(Pc().mutex);
  const unsigned made = Pc().calls[function];
  Pc().failing = function;
  Pc().failFrom = made + from;
  Pc().failTo = to > UINT_MAX - made ? UINT_MAX : made + to;
}

void BeforeCalls(std::function<void(unsigned)> visit) {
  const std::lock_guard lock(Pc().mutex);
  Pc().before = std::move(visit);
}

namespace {

std::string BytesOf(const std::u16string& text) {
  return {reinterpret_cast<const char*>(text.c_str()), (text.size() + 1) * 2};
}
std::string BytesOf(const std::vector<std::u16string>& list) {
  std::string bytes;
  for (const std::u16string& text : list) bytes += BytesOf(text);
  return bytes + BytesOf(std::u16string());
}
template <class Number>
std::string BytesOf(const Number& number) {
  static_assert(sizeof number == 4);
  return {reinterpret_cast<const char*>(&number), 4};
}

}  // namespace

std::optional<std::pair<DWORD, std::string>> PropertyOf(const sim::Device& device, DWORD property) {
  const auto value = [](DWORD type,
                        const auto& member) -> std::optional<std::pair<DWORD, std::string>> {
    if (!member) return std::nullopt;
    return std::pair(type, BytesOf(*member));
  };
  switch (property) {
    case SPDRP_DEVICEDESC:
      return value(REG_SZ, device.description);
    case SPDRP_HARDWAREID:
      return value(REG_MULTI_SZ, device.hardwareIds);
    case SPDRP_SERVICE:
      return value(REG_SZ, device.service);
    case SPDRP_CLASS:
      return value(REG_SZ, device.deviceClass);
    case SPDRP_CLASSGUID:
      return value(REG_SZ, device.classGuid);
    case SPDRP_DRIVER:
      return value(REG_SZ, device.driver);
    case SPDRP_MFG:
      return value(REG_SZ, device.manufacturer);
    case SPDRP_FRIENDLYNAME:
      return value(REG_SZ, device.friendlyName);
    case SPDRP_LOCATION_INFORMATION:
      return value(REG_SZ, device.location);
    case SPDRP_PHYSICAL_DEVICE_OBJECT_NAME:
      return value(REG_SZ, device.physicalName);
    case SPDRP_UI_NUMBER:
      return value(REG_DWORD, device.uiNumber);
    case SPDRP_LEGACYBUSTYPE:
      return value(REG_DWORD, device.legacyBusType);
    case SPDRP_ENUMERATOR_NAME:
      return value(REG_SZ, device.enumerator);
    default:
      return std::nullopt;
  }
}

namespace {

// Calls visit(DLL, function, slot) for each import by name.
template <class Visit>
void VisitImports(HMODULE module, Visit visit) {
  auto* const base = reinterpret_cast<unsigned char*>(module);
  const auto* const dos = reinterpret_cast<const IMAGE_DOS_HEADER*>(base);
  const auto* const headers = reinterpret_cast<const IMAGE_NT_HEADERS*>(base + dos->e_lfanew);
  const DWORD place =
      headers->OptionalHeader.DataDirectory[IMAGE_DIRECTORY_ENTRY_IMPORT].VirtualAddress;
  for (auto* dll = reinterpret_cast<const IMAGE_IMPORT_DESCRIPTOR*>(base + place); dll->Name != 0;
       ++dll) {
    const auto* name = reinterpret_cast<const IMAGE_THUNK_DATA*>(base + dll->OriginalFirstThunk);
    auto* slot = reinterpret_cast<IMAGE_THUNK_DATA*>(base + dll->FirstThunk);
    for (; name->u1.AddressOfData != 0; ++name, ++slot) {
      const auto* const entry =
          reinterpret_cast<const IMAGE_IMPORT_BY_NAME*>(base + name->u1.AddressOfData);
      visit(std::string(reinterpret_cast<const char*>(base + dll->Name)),
            std::string(reinterpret_cast<const char*>(entry->Name)), slot);
    }
  }
}

void Put(IMAGE_THUNK_DATA* slot, void* function) {
  DWORD before = 0;
  VirtualProtect(slot, sizeof *slot, PAGE_READWRITE, &before);
  slot->u1.Function = reinterpret_cast<std::uintptr_t>(function);
  VirtualProtect(slot, sizeof *slot, before, &before);
}

}  // namespace

void Attach(HMODULE module) {
  Functions functions = SetupFunctions();
  for (const Functions& more :
       {NodeFunctions(), FileFunctions(), VolumeFunctions(), NotificationFunctions()}) {
    functions.insert(more.begin(), more.end());
  }
  VisitImports(module,
               [&](const std::string& dll, const std::string& function, IMAGE_THUNK_DATA* slot) {
                 if (const auto own = functions.find(function); own != functions.end())
                   return Put(slot, own->second);
                 const bool machine = _stricmp(dll.c_str(), "SETUPAPI.dll") == 0 ||
                                      _stricmp(dll.c_str(), "cfgmgr32.dll") == 0 ||
                                      function.find("Volume") != function.npos ||
                                      function.find("Drive") != function.npos;
                 if (machine)
                   Pc().breaches.insert(dll + " " + function + ": imported, and not known here");
               });
}

bool Replace(HMODULE module, const std::string& function, void* with) {
  bool replaced = false;
  VisitImports(module, [&](const std::string&, const std::string& name, IMAGE_THUNK_DATA* slot) {
    if (name != function) return;
    Put(slot, with);
    replaced = true;
  });
  return replaced;
}

}  // namespace abi_pc
