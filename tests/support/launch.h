// Threads of a simulated process that run what a test says, and windows of theirs.
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

inline platform::Status RegisterWindowClass(platform::Desktop& desktop, platform::WindowProcedure procedure,
                                            const char16_t* name = u"Class") {
  platform::WNDCLASSW windowClass;
  windowClass.lpfnWndProc = procedure;
  windowClass.lpszClassName = name;
  return desktop.RegisterClassW(windowClass);
}
inline platform::Status MakeWindow(platform::Desktop& desktop, platform::WindowHandle& window,
                                   platform::WindowHandle parent = 0) {
  platform::CREATESTRUCTW creation;
  creation.lpszClass = u"Class";
  creation.hwndParent = parent;
  return desktop.CreateWindowExW(creation, window);
}
inline void PumpMessages(platform::Desktop& desktop) {
  platform::MSG message;
  while (desktop.GetMessageW(message, 0, 0, 0) != 0) desktop.DispatchMessageW(message);
}

}  // namespace testing_support
