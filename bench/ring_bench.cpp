// What it costs to copy an owning reference and to let it go again: NodePtr, whose links change
// under one process-wide lock, beside the standard shared pointer, which counts.
#include <benchmark/benchmark.h>

#include <chrono>
#include <memory>
#include <stop_token>
#include <thread>
#include <vector>

#include "records/node.h"
#include "records/records.h"

namespace {

using KelvoUHW::CZKUMHubPortImpl;
using KelvoUHW::NodePtr;

// The standard pointer counts without atomics while the process has one thread only, which a
// program that listens to device events never has.
class SecondThread {
 private:
  std::jthread m_thread{[](const std::stop_token& stop) {
    while (!stop.stop_requested()) std::this_thread::sleep_for(std::chrono::milliseconds(1));
  }};
};

template <class Pointer>
void CopyAndRelease(benchmark::State& state, const Pointer& first) {
  const SecondThread second;
  const std::vector<Pointer> others(static_cast<std::size_t>(state.range(0)), first);
  for ([[maybe_unused]] const auto& iteration : state) {
    Pointer copy(first);
    benchmark::DoNotOptimize(copy);
  }
}

void BM_NodePtr(benchmark::State& state) {
  CopyAndRelease(state, NodePtr(KelvoUHW::MakeRecord<CZKUMHubPortImpl>(1u)));
}
void BM_SharedPtr(benchmark::State& state) {
  CopyAndRelease(state, std::make_shared<CZKUMHubPortImpl>(1u));
}

// Two threads, each with a record of its own: what they share is the lock alone.
void BM_NodePtrContended(benchmark::State& state) {
  const NodePtr first = KelvoUHW::MakeRecord<CZKUMHubPortImpl>(1u);
  for ([[maybe_unused]] const auto& iteration : state) {
    NodePtr copy(first);
    benchmark::DoNotOptimize(copy);
  }
}

// The argument: how many other references the record has.
BENCHMARK(BM_NodePtr)->Arg(0)->Arg(100);
BENCHMARK(BM_SharedPtr)->Arg(0)->Arg(100);
BENCHMARK(BM_NodePtrContended)->Threads(2)->UseRealTime();

}  // namespace
