#include "tools/zkusb/interrupt.h"

#include <csignal>

namespace zkusb {

namespace {

volatile std::sig_atomic_t s_happened = 0;

extern "C" void Note(int) { s_happened = 1; }

}  // namespace

Interrupt::Interrupt() {
  s_happened = 0;
  m_before = std::signal(SIGINT, Note);
}

Interrupt::~Interrupt() { std::signal(SIGINT, m_before); }

bool Interrupt::Happened() noexcept { return s_happened != 0; }

}  // namespace zkusb
