#include "platform/windows/native_types.h"
#include "platform/windows/windows_host.h"

namespace platform::windows {

static_assert(kGENERIC_WRITE == GENERIC_WRITE && kFILE_SHARE_READ == FILE_SHARE_READ &&
              kFILE_SHARE_WRITE == FILE_SHARE_WRITE);

Status WindowsHost::OpenDevice(const char16_t* path, std::uint32_t access, std::uint32_t share,
                               FileHandle& handle) noexcept {
  return TakeHandle(CreateFileW(Native(path), access, share, nullptr, OPEN_EXISTING, 0, nullptr),
                    handle);
}

Status WindowsHost::DeviceControl(FileHandle handle, std::uint32_t code, const void* in,
                                  std::uint32_t inBytes, void* out, std::uint32_t outBytes,
                                  std::uint32_t& returnedBytes) noexcept {
  returnedBytes = 0;
  // The system takes the input by a pointer that may write, and does not write there.
  return FromBool(DeviceIoControl(Native(handle), code, const_cast<void*>(in), inBytes, out,
                                  outBytes, Native(&returnedBytes), nullptr));
}

Status WindowsHost::CloseDevice(FileHandle handle) noexcept {
  return FromBool(CloseHandle(Native(handle)));
}

}  // namespace platform::windows
