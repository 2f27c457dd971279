// A host whose drivers answer some requests as a test says and all others as the base does.
#pragma once

#include <algorithm>
#include <cstring>
#include <functional>
#include <map>
#include <string>
#include <utility>
#include <vector>

#include "platform/wrappers/intercepting_host.h"

namespace KelvoUHW {

class ScriptedDriver : public platform::wrappers::InterceptingHost {
 public:
  // Sees the buffers of one request; returns the outcome.
  using Answer =
      std::function<platform::Status(const void* in, void* out, std::uint32_t outBytes, std::uint32_t& returned)>;
  using InterceptingHost::InterceptingHost;
  // The n-th request with this code is answered by the n-th answer given; later ones by the base.
  void Next(std::uint32_t code, Answer answer) { m_answers[code].push_back(std::move(answer)); }
  // Every request with this code changes the base's answer.
  void Always(std::uint32_t code, Answer change) { m_changes[code] = std::move(change); }
  platform::Status DeviceControl(platform::FileHandle handle, std::uint32_t code, const void* in, std::uint32_t inBytes,
                                 void* out, std::uint32_t outBytes, std::uint32_t& returned) noexcept override {
    if (auto& answers = m_answers[code]; !answers.empty()) {
      const Answer answer = std::move(answers.front());
      answers.erase(answers.begin());
      returned = 0;
      return answer(in, out, outBytes, returned);
    }
    const platform::Status status = InterceptingHost::DeviceControl(handle, code, in, inBytes, out, outBytes, returned);
    const auto change = m_changes.find(code);
    return !status || change == m_changes.end() ? status : change->second(in, out, outBytes, returned);
  }

 private:
  platform::Status BeforeCall(const platform::wrappers::HostCall&) noexcept override { return {}; }
  std::map<std::uint32_t, std::vector<Answer>> m_answers;
  std::map<std::uint32_t, Answer> m_changes;
};

// A name answer: the length it claims at an offset, then characters as far as they fit.
inline ScriptedDriver::Answer NameAnswer(std::size_t head, std::uint32_t actualLength, std::u16string text,
                                         std::uint32_t received) {
  return [=](const void*, void* out, std::uint32_t outBytes, std::uint32_t& returned) {
    auto* bytes = static_cast<std::uint8_t*>(out);
    if (outBytes >= head) std::memcpy(bytes + head - 4, &actualLength, sizeof actualLength);
    const std::size_t room = outBytes > head ? outBytes - head : 0;
    std::memcpy(bytes + head, text.data(), std::min(room, text.size() * sizeof(char16_t)));
    returned = received;
    return platform::Status::Success();
  };
}

inline platform::Status RefuseRequest(const void*, void*, std::uint32_t, std::uint32_t&) {
  return platform::Status::Failure(31);
}

}  // namespace KelvoUHW
