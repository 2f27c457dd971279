// Threads of a simulated process that run what a test says.
#pragma once

#include <gtest/gtest.h>

#include <functional>
#include <memory>
#include <utility>

#include "platform/desktop.h"

namespace testing_support {

inline void Launch(platform::Threads& threads, std::function<void()> body) {
  using Body = std::function<void()>;
  auto owned = std::make_unique<Body>(std::move(body));
  const auto run = [](void* argument) { (*std::unique_ptr<Body>(static_cast<Body*>(argument)))(); };
  ASSERT_TRUE(threads.StartThread(run, 0, owned.get()));
  static_cast<void>(owned.release());
}

}  // namespace testing_support
