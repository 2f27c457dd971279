// Ctrl-C as a question.
#pragma once

namespace zkusb {

// While one lives, Ctrl-C does not end the program: it makes Happened() true. One at a time.
class Interrupt {
 public:
  Interrupt();
  ~Interrupt();
  Interrupt(const Interrupt&) = delete;
  Interrupt& operator=(const Interrupt&) = delete;

  static bool Happened() noexcept;

 private:
  void (*m_before)(int);
};

}  // namespace zkusb
