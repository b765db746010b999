#include <benchmark/benchmark.h>

#include <atomic>
#include <mutex>
#include <thread>

#include "Comparison.h"
#include "Runtime/Locks/UnfairLock.h"

namespace {

template <class Lock>
void uncontended(benchmark::State& state) {
  Lock lock;
  for (auto _ : state) {
    lock.lock();
    benchmark::ClobberMemory();
    lock.unlock();
  }
}

// Measures the time in which two threads enter a short critical section a fixed number of times.
template <class Lock>
void contended(benchmark::State& state) {
  constexpr int kTurns = 200'000;
  struct Shared {
    Lock lock;
    alignas(64) long value = 0;
  };
  for (auto _ : state) {
    Shared shared;
    std::atomic<int> ready = 0;
    const auto takeTurns = [&] {
      ++ready;
      while (ready < 2) std::this_thread::yield();
      for (int turn = 0; turn < kTurns; ++turn) {
        shared.lock.lock();
        benchmark::DoNotOptimize(++shared.value);
        shared.lock.unlock();
      }
    };
    std::thread other(takeTurns);
    takeTurns();
    other.join();
  }
  state.SetItemsProcessed(state.iterations() * 2 * kTurns);
}

BENCHMARK(uncontended<rt::UnfairLock>)->Name("UnfairLock/uncontended/ours");
BENCHMARK(uncontended<std::mutex>)->Name("UnfairLock/uncontended/std::mutex");
BENCHMARK(contended<rt::UnfairLock>)->Name("UnfairLock/contended/ours")->UseRealTime();
BENCHMARK(contended<std::mutex>)->Name("UnfairLock/contended/std::mutex")->UseRealTime();

const Bound uncontendedBound("UnfairLock/uncontended", "std::mutex", 1.0);
const Bound contendedBound("UnfairLock/contended", "std::mutex", 1.2);

}  // namespace
