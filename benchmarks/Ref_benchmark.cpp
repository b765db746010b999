// Compares references with the standard library's, and casts with the compiler's.

#include <benchmark/benchmark.h>

#include <functional>
#include <memory>

#include "Comparison.h"
#include "Runtime/Objects/Block.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/Weak.h"
#include "tests/support/TestClocks.h"

namespace {

const SecondThread secondThread;

struct Unused : rt::Protocol<Unused> {
 protected:
  ~Unused() = default;
};

class SystemClock : public rt::Implements<SystemClock, rt::Object, AlarmClock> {
 public:
  int now() const override { return 1; }
  int alarm() const override { return 2; }
};
class QuartzClock : public rt::Implements<QuartzClock, SystemClock> {};

// A class for std::shared_ptr, without a reference count of its own.
struct PlainClock {
  virtual ~PlainClock() = default;
  virtual int now() const { return 1; }
};

void copyRef(benchmark::State& state) {
  const rt::Ref<SystemClock> ref = rt::make<SystemClock>();
  for (auto _ : state) {
    rt::Ref<SystemClock> copy = ref;
    benchmark::DoNotOptimize(copy);
  }
}
void copySharedPointer(benchmark::State& state) {
  const std::shared_ptr<PlainClock> pointer = std::make_shared<PlainClock>();
  for (auto _ : state) {
    std::shared_ptr<PlainClock> copy = pointer;
    benchmark::DoNotOptimize(copy);
  }
}
void copyProtocolRef(benchmark::State& state) {
  const rt::Ref<Clock> ref = rt::make<SystemClock>();
  for (auto _ : state) {
    rt::Ref<Clock> copy = ref;
    benchmark::DoNotOptimize(copy);
  }
}

void makeRef(benchmark::State& state) {
  for (auto _ : state) benchmark::DoNotOptimize(rt::make<SystemClock>());
}
void makeSharedPointer(benchmark::State& state) {
  for (auto _ : state) benchmark::DoNotOptimize(std::make_shared<PlainClock>());
}

void lockWeak(benchmark::State& state) {
  const rt::Ref<SystemClock> ref = rt::make<SystemClock>();
  const rt::Weak<SystemClock> weak = ref;
  for (auto _ : state) benchmark::DoNotOptimize(weak.lock());
}
void lockWeakPointer(benchmark::State& state) {
  const std::shared_ptr<PlainClock> pointer = std::make_shared<PlainClock>();
  const std::weak_ptr<PlainClock> weak = pointer;
  for (auto _ : state) benchmark::DoNotOptimize(weak.lock());
}

template <class Target>
void castByRecords(benchmark::State& state) {
  const rt::Ref<rt::Object> ref = rt::make<QuartzClock>();
  rt::Object* object = ref.get();
  for (auto _ : state) {
    benchmark::DoNotOptimize(object);
    benchmark::DoNotOptimize(rt::cast<Target>(object));
  }
}
template <class Target>
void castByCompiler(benchmark::State& state) {
  const rt::Ref<rt::Object> ref = rt::make<QuartzClock>();
  rt::Object* object = ref.get();
  for (auto _ : state) {
    benchmark::DoNotOptimize(object);
    benchmark::DoNotOptimize(dynamic_cast<Target*>(object));
  }
}

void callBlock(benchmark::State& state) {
  int value = 1;
  rt::Block<int()> block = [&value] { return value; };
  for (auto _ : state) {
    benchmark::DoNotOptimize(block);
    benchmark::DoNotOptimize(block());
  }
}
void copyBlock(benchmark::State& state) {
  int values[8] = {1, 2, 3};
  const rt::Block<int()> block = [values] { return values[0]; };
  for (auto _ : state) {
    rt::Block<int()> copy = block;
    benchmark::DoNotOptimize(copy);
  }
}
void copyFunction(benchmark::State& state) {
  int values[8] = {1, 2, 3};
  const std::function<int()> function = [values] { return values[0]; };
  for (auto _ : state) {
    std::function<int()> copy = function;
    benchmark::DoNotOptimize(copy);
  }
}

BENCHMARK(copyRef)->Name("Ref/copy/ours");
BENCHMARK(copySharedPointer)->Name("Ref/copy/shared_ptr");
BENCHMARK(copyProtocolRef)->Name("Ref/copy-protocol/ours");
BENCHMARK(copySharedPointer)->Name("Ref/copy-protocol/shared_ptr");
BENCHMARK(makeRef)->Name("Ref/make/ours");
BENCHMARK(makeSharedPointer)->Name("Ref/make/shared_ptr");
BENCHMARK(lockWeak)->Name("Weak/lock/ours");
BENCHMARK(lockWeakPointer)->Name("Weak/lock/weak_ptr");
BENCHMARK(castByRecords<AlarmClock>)->Name("Cast/protocol/ours");
BENCHMARK(castByCompiler<AlarmClock>)->Name("Cast/protocol/dynamic_cast");
BENCHMARK(castByRecords<Clock>)->Name("Cast/inherited-protocol/ours");
BENCHMARK(castByCompiler<Clock>)->Name("Cast/inherited-protocol/dynamic_cast");
BENCHMARK(castByRecords<Unused>)->Name("Cast/refused/ours");
BENCHMARK(castByCompiler<Unused>)->Name("Cast/refused/dynamic_cast");
BENCHMARK(castByRecords<SystemClock>)->Name("Cast/superclass/ours");
BENCHMARK(castByCompiler<SystemClock>)->Name("Cast/superclass/dynamic_cast");
BENCHMARK(callBlock)->Name("Block/call/ours");
BENCHMARK(copyBlock)->Name("Block/copy/ours");
BENCHMARK(copyFunction)->Name("Block/copy/std::function");

const Bound copy{"Ref/copy", "shared_ptr", 1.1};
const Bound protocol{"Cast/protocol", "dynamic_cast", 0.2};
const Bound inheritedProtocol{"Cast/inherited-protocol", "dynamic_cast", 0.2};
const Bound refused{"Cast/refused", "dynamic_cast", 0.2};

}  // namespace
