// Measures what profiling of services costs while it is on, and while it is off.

#include <benchmark/benchmark.h>

#include "Comparison.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLClassType.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLImplementation.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLPProfilingEnabled.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLPProfilingMeasurement.h"

namespace {

const SecondThread secondThread;

using rt::Ref;

class Service final : public rt::Implements<Service, rt::Object> {};

constexpr SRLAPIRegistrationData kAPI{.identifier = "Service", .identifierLength = 7};

// Makes a new instance for each request, so that the measurements are added up and not stored.
Ref<SRLImplementation> implementation() {
  return SRLImplementation::initWithIdentifier(
      "Service", SRLClassType::initWithClass(&rt::classInfo<Service>()), 1, 0,
      [](const SRLScopeTagSet&, bool* instanceCreated) -> Ref<rt::Object> {
        *instanceCreated = true;
        return rt::make<Service>();
      },
      nullptr);
}

Ref<rt::Object> make(const SRLImplementation& implementation) {
  bool isCreated = false;
  return implementation.factoryBlock()({}, &isCreated);
}

void makeBare(benchmark::State& state) {
  const Ref<SRLImplementation> asked = implementation();
  for (auto _ : state) benchmark::DoNotOptimize(make(*asked));
}

void makeUnmeasured(benchmark::State& state) {
  const Ref<SRLImplementation> asked = implementation();
  for (auto _ : state) {
    if (SRLPProfilingEnabled()) state.SkipWithError("profiling is on in this build");
    benchmark::DoNotOptimize(make(*asked));
  }
}

void makeMeasured(benchmark::State& state) {
  const Ref<SRLImplementation> asked = implementation();
  for (auto _ : state) {
    const SRLPProfilingMeasurementPartial partial = SRLPCaptureInjectionStart(asked);
    benchmark::DoNotOptimize(make(*asked));
    SRLPCaptureInjectionEnd(partial, &kAPI, asked);
  }
}

void makeCancelled(benchmark::State& state) {
  const Ref<SRLImplementation> asked = implementation();
  for (auto _ : state) {
    SRLPCaptureInjectionStart(asked);
    benchmark::DoNotOptimize(make(*asked));
    SRLPCaptureInjectionCancel();
  }
}

BENCHMARK(makeUnmeasured)->Name("Profiling/off/ours");
BENCHMARK(makeBare)->Name("Profiling/off/bare");
const Bound offBound{"Profiling/off", "bare", 1.1};
BENCHMARK(makeMeasured)->Name("Profiling/on/ours");
BENCHMARK(makeBare)->Name("Profiling/on/bare");
BENCHMARK(makeCancelled)->Name("Profiling/on, nothing new/ours");
BENCHMARK(makeBare)->Name("Profiling/on, nothing new/bare");

}  // namespace
