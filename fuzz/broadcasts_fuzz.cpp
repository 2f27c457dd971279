// Device broadcasts of any content: nothing is read behind the size that a record states, and an
// event thread is asked for exactly when the record says so.
//
// The input is the event, one bit, and the record; its size field is made true where it says more.
#include <algorithm>
#include <cstring>
#include <vector>

#include "fuzz/fuzz.h"
#include "monitor/usb_event_receiver.h"
#include "platform/system.h"
#include "platform/text.h"

namespace {

using namespace KelvoUHW;
using fuzz::Require;

// Counts who asks for a thread, and has none.
struct NoThreads final : platform::Threads {
  int asked = 0;
  bool StartThread(platform::ThreadRoutine, std::uint32_t, void*) noexcept override {
    ++asked;
    return false;
  }
  void Sleep(std::uint32_t) override {}
  std::uint32_t CurrentThreadId() noexcept override { return 1; }
  [[noreturn]] void ExitProcess(std::uint32_t) override { std::abort(); }
  platform::Status PinModule(const void*) noexcept override { return {}; }
};

// Where the name is that of a watched device: USB#VID_05AC&PID_129x# behind four characters that
// nobody looks at, in any case.
bool MayBeWatched(const std::vector<std::uint8_t>& record) {
  std::u16string name;
  for (std::size_t i = platform::kInterfaceBroadcastNameOffset; i + 2 <= record.size(); i += 2) {
    name += static_cast<char16_t>(record[i] | record[i + 1] << 8);
  }
  name = platform::ToUpper(platform::UpToZero(name));
  return name.find(u"VID_") != name.npos && name.find(u"PID_") != name.npos;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static NoThreads threads;
  platform::SetCurrentSystem({.threads = &threads});
  fuzz::Input input(data, size);
  const bool arrival = input.Byte() % 2 == 0;
  std::vector<std::uint8_t> record(input.Rest().begin(), input.Rest().end());
  std::uint32_t stated = 0, type = 0;
  if (record.size() < sizeof(platform::DEV_BROADCAST_HDR)) {
    record.resize(sizeof(platform::DEV_BROADCAST_HDR));
    stated = static_cast<std::uint32_t>(input.Rest().size());
  } else {
    std::memcpy(&stated, record.data(), sizeof stated);
    stated = std::min(stated, static_cast<std::uint32_t>(record.size()));
  }
  std::memcpy(record.data(), &stated, sizeof stated);
  std::memcpy(&type, record.data() + 4, sizeof type);
  // The sanitizer sees a read behind the stated size.
  record.resize(std::max<std::size_t>(stated, sizeof(platform::DEV_BROADCAST_HDR)));
  record.shrink_to_fit();

  static CZKUMUsbEventReceiver receiver;
  const auto* header = reinterpret_cast<const platform::DEV_BROADCAST_HDR*>(record.data());
  const bool watched = CZKUMUsbEventReceiver::IsWatchedDevice(header);
  Require(!watched || MayBeWatched(record), "watched by its ids");
  threads.asked = 0;
  const BOOL answer = receiver.OnDeviceChange(
      arrival ? platform::kDBT_DEVICEARRIVAL : platform::kDBT_DEVICEREMOVECOMPLETE,
      reinterpret_cast<platform::LParam>(header));
  const bool starts = stated >= sizeof(platform::DEV_BROADCAST_HDR) &&
                      (type == platform::kDBT_DEVTYP_VOLUME || watched);
  Require(threads.asked == (starts ? 1 : 0), "one thread where the record says so");
  Require((answer != FALSE) == !starts, "and the loss of it is told");
  return 0;
}
