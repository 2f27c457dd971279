#include <cstring>
#include <optional>

#include "platform/text.h"
#include "simulation/pc/requests.h"
#include "simulation/pc/state.h"

namespace platform::simulated {
namespace {

constexpr std::uint32_t kERROR_NOACCESS = 998;

// A controller's name wins over a device interface's: a controller may be opened by its interface.
std::optional<OpenFile> FindFile(const MachineIndex& index, const Text& key) {
  constexpr MachineIndex::Position kNone = MachineIndex::kNone;
  if (index.Controller(key) != kNone) return OpenFile{FileKind::Controller, key};
  // A symbolic name opens in both namespaces, as its device interface does.
  constexpr std::size_t kPrefix = 4;
  if (key.starts_with(u"\\\\.\\") || key.starts_with(u"\\\\?\\")) {
    Text name = key.substr(kPrefix);
    if (index.Hub(name) != kNone) return OpenFile{FileKind::Hub, std::move(name)};
  }
  if (index.Interface(key) != kNone) return OpenFile{FileKind::Interface, key};
  if (IsDriveName(key) && index.Drive(key[kPrefix]) != kNone) {
    return OpenFile{FileKind::Drive, key};
  }
  return std::nullopt;
}

Status Answer(const IndexedMachine& now, const OpenFile& file, Request& request) {
  switch (file.kind) {
    case FileKind::Controller:
      return AnswerController(now.machine.hostControllers[now.index.Controller(file.key)], request);
    case FileKind::Hub:
      return AnswerHub(now.machine.hubs[now.index.Hub(file.key)], request);
    case FileKind::Interface:
    case FileKind::Drive:
      break;
  }
  const MachineIndex::Position storage = now.index.Storage(file.key);
  return AnswerStorage(storage == MachineIndex::kNone ? nullptr : &now.machine.storage[storage],
                       request);
}

}  // namespace

Status SimulatedPc::OpenDevice(const char16_t* path, std::uint32_t, std::uint32_t,
                               FileHandle& handle) noexcept {
  handle = kInvalidHandle;
  if (path == nullptr) return Status::Failure(kERROR_INVALID_PARAMETER);
  const std::lock_guard lock(m_state->mutex);
  std::optional<OpenFile> file = FindFile(m_state->now->index, ToLower(std::u16string_view(path)));
  if (!file) return Status::Failure(kERROR_FILE_NOT_FOUND);
  handle = m_state->handles.Open(std::move(*file), path);
  return Status::Success();
}

Status SimulatedPc::DeviceControl(FileHandle handle, std::uint32_t code, const void* in,
                                  std::uint32_t inBytes, void* out, std::uint32_t outBytes,
                                  std::uint32_t& returnedBytes) noexcept {
  returnedBytes = 0;
  const std::lock_guard lock(m_state->mutex);
  const auto* file = m_state->handles.Find<OpenFile>(handle);
  if (file == nullptr) return Status::Failure(kERROR_INVALID_HANDLE);
  if ((in == nullptr && inBytes > 0) || (out == nullptr && outBytes > 0)) {
    return Status::Failure(kERROR_NOACCESS);
  }
  if (file->gone) return Status::Failure(kERROR_DEVICE_NOT_CONNECTED);
  Request request{code, {}, outBytes, {}};
  if (inBytes > 0) {
    const auto* bytes = static_cast<const std::uint8_t*>(in);
    request.input.assign(bytes, bytes + inBytes);
  }
  if (const Status answered = Answer(*m_state->now, *file, request); !answered) return answered;
  // Only what the driver returned is copied back; the rest of the caller's buffer stays as it is.
  if (!request.reply.empty()) std::memcpy(out, request.reply.data(), request.reply.size());
  returnedBytes = static_cast<std::uint32_t>(request.reply.size());
  return Status::Success();
}

Status SimulatedPc::CloseDevice(FileHandle handle) noexcept {
  const std::lock_guard lock(m_state->mutex);
  return m_state->handles.Close<OpenFile>(handle);
}

}  // namespace platform::simulated
