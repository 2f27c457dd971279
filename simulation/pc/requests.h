// What host controllers and hubs answer to requests.
#pragma once

#include <cstdint>
#include <vector>

#include "platform/host.h"
#include "simulation/machine/machine.h"

namespace platform::simulated {

using Bytes = std::vector<std::uint8_t>;

// A request as a driver sees it: the input is its own copy, the reply is copied to the caller
// behind it. `reply` holds at most `outBytes` bytes, and none with a failure.
struct Request {
  std::uint32_t code;
  Bytes input;
  std::uint32_t outBytes;
  Bytes reply;
};

Status AnswerController(const HostController& controller, Request& request);
Status AnswerHub(const Hub& hub, Request& request);
// `storage` null: a device that refuses every storage request.
Status AnswerStorage(const Storage* storage, Request& request);

}  // namespace platform::simulated
