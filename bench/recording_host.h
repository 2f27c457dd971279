// The floor of a piece of work: its platform calls alone.
#pragma once

#include <cstddef>
#include <functional>
#include <memory>

#include "platform/host.h"

namespace bench {

// The calls that a host was asked, in order.
class Recording {
 public:
  Recording();
  ~Recording();

  // A host that forwards to `base` and records. It serves one thread and lives as long as this.
  platform::Host& Host(platform::Host& base);

  void Clear();
  std::size_t Calls() const noexcept;
  // Makes the same calls to a host in the same state, with the same arguments and buffers of the
  // same sizes; where a recorded call opened a handle, that of its repetition takes its place.
  // Returns how many calls ended otherwise than when recorded.
  std::size_t Replay(platform::Host& host) const;

 private:
  class Recorder;
  std::unique_ptr<Recorder> m_recorder;
};

}  // namespace bench
