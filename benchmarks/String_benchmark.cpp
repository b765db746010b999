#include <benchmark/benchmark.h>

#include <string>

#include "Comparison.h"
#include "Runtime/Objects/String.h"

namespace {

using namespace rt::literals;

// std::string stores the short text without allocating, and allocates for the long one.
constexpr const char* kShort = "short text";
constexpr const char* kLong = "a text that is a good deal longer than any buffer within a string is";

std::string paragraph() {
  std::string text;
  text.resize(1000, 'x');
  return text;
}

template <class Text>
void copy(benchmark::State& state, const Text& text) {
  for (auto _ : state) {
    Text copied = text;
    benchmark::DoNotOptimize(copied);
  }
}

void literal(benchmark::State& state) {
  for (auto _ : state) {
    rt::String text = "a text that is a good deal longer than any buffer within a string is"_s;
    benchmark::DoNotOptimize(text);
  }
}

void literalOfStandardLibrary(benchmark::State& state) {
  for (auto _ : state) {
    std::string text = kLong;
    benchmark::DoNotOptimize(text);
  }
}

BENCHMARK_CAPTURE(copy, , rt::String::fromUTF8(kShort))->Name("String/copy short/ours");
BENCHMARK_CAPTURE(copy, , std::string(kShort))->Name("String/copy short/std::string");
BENCHMARK_CAPTURE(copy, , rt::String::fromUTF8(kLong))->Name("String/copy long/ours");
BENCHMARK_CAPTURE(copy, , std::string(kLong))->Name("String/copy long/std::string");
BENCHMARK_CAPTURE(copy, , rt::String::fromUTF8(paragraph()))->Name("String/copy paragraph/ours");
BENCHMARK_CAPTURE(copy, , paragraph())->Name("String/copy paragraph/std::string");
BENCHMARK_CAPTURE(copy, , "short text"_s)->Name("String/copy literal/ours");
BENCHMARK_CAPTURE(copy, , std::string(kShort))->Name("String/copy literal/std::string");
BENCHMARK(literal)->Name("String/from literal/ours");
BENCHMARK(literalOfStandardLibrary)->Name("String/from literal/std::string");

const Bound paragraphBound("String/copy paragraph", "std::string", 1.0);
const Bound copyBound("String/copy literal", "std::string", 1.0);
const Bound literalBound("String/from literal", "std::string", 1.0);

}  // namespace
