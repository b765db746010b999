// Compares formatting with snprintf and fmt. snprintf writes to a buffer on the stack and allocates nothing.
// fmt makes a std::string. Ours makes an rt::String, with one allocation.
#include <benchmark/benchmark.h>
#include <fmt/format.h>

#include <cstdio>
#include <string>

#include "Comparison.h"
#include "Runtime/Text/Format.h"

namespace {

using namespace rt::literals;

// With the rest of the line, this is too long for a std::string to store without allocating.
const char* const kName = "SystemClock";
const rt::String kNameString = rt::String::fromUTF8(kName);

void objectAndInteger(benchmark::State& state) {
  int value = 12345;
  for (auto _ : state) {
    benchmark::DoNotOptimize(value);
    rt::String text = rt::format("%@ %d is what it took", kNameString, value);
    benchmark::DoNotOptimize(text);
  }
}

void textAndInteger(benchmark::State& state) {
  int value = 12345;
  for (auto _ : state) {
    benchmark::DoNotOptimize(value);
    rt::String text = rt::format("%s %d is what it took", kName, value);
    benchmark::DoNotOptimize(text);
  }
}

void textAndIntegerOfC(benchmark::State& state) {
  int value = 12345;
  char text[512];
  for (auto _ : state) {
    benchmark::DoNotOptimize(value);
    benchmark::DoNotOptimize(std::snprintf(text, sizeof text, "%s %d is what it took", kName, value));
    benchmark::ClobberMemory();
  }
}

void textAndIntegerOfFmt(benchmark::State& state) {
  int value = 12345;
  for (auto _ : state) {
    benchmark::DoNotOptimize(value);
    std::string text = fmt::format("{} {} is what it took", kName, value);
    benchmark::DoNotOptimize(text);
  }
}

void real(benchmark::State& state) {
  double value = 1234.5678;
  for (auto _ : state) {
    benchmark::DoNotOptimize(value);
    rt::String text = rt::format("%8.3f ms", value);
    benchmark::DoNotOptimize(text);
  }
}

void realOfC(benchmark::State& state) {
  double value = 1234.5678;
  char text[512];
  for (auto _ : state) {
    benchmark::DoNotOptimize(value);
    benchmark::DoNotOptimize(std::snprintf(text, sizeof text, "%8.3f ms", value));
    benchmark::ClobberMemory();
  }
}

void realOfFmt(benchmark::State& state) {
  double value = 1234.5678;
  for (auto _ : state) {
    benchmark::DoNotOptimize(value);
    std::string text = fmt::format("{:8.3f} ms", value);
    benchmark::DoNotOptimize(text);
  }
}

BENCHMARK(objectAndInteger)->Name("Format/%@ %d/ours");
BENCHMARK(textAndIntegerOfC)->Name("Format/%@ %d/snprintf");
BENCHMARK(textAndIntegerOfFmt)->Name("Format/%@ %d/fmt");
BENCHMARK(textAndInteger)->Name("Format/%s %d/ours");
BENCHMARK(textAndIntegerOfC)->Name("Format/%s %d/snprintf");
BENCHMARK(textAndIntegerOfFmt)->Name("Format/%s %d/fmt");
BENCHMARK(real)->Name("Format/%8.3f/ours");
BENCHMARK(realOfC)->Name("Format/%8.3f/snprintf");
BENCHMARK(realOfFmt)->Name("Format/%8.3f/fmt");

const Bound objectBound("Format/%@ %d", "snprintf", 1.5);
const Bound textBound("Format/%s %d", "snprintf", 1.5);

}  // namespace
