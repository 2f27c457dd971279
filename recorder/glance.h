// A quick look at a PC.
#pragma once

#include <string>

#include "platform/host.h"

namespace recorder {

// Which devices are there and what is mounted where, as a text to compare with an earlier one: far
// cheaper than a recording, and no driver of a hub or a disk is asked. Callable from every thread;
// throws std::bad_alloc only.
std::u16string Glance(platform::Host& host);

}  // namespace recorder
