// Compares a line of JSON with a line of the usual pattern, for one message with and one without fields. The
// line of JSON has more: the whole path, the function, and the process.

#include <benchmark/benchmark.h>

#include "Comparison.h"
#include "Shared/Logging/LUMLogMessage.h"
#include "Shared/Logging/Loggers/LUMLogJSON.h"
#include "Shared/Logging/Loggers/LUMLogPattern.h"
#include "Shared/Logging/Loggers/Private/LUMLogRenderedLine.h"

namespace {

using namespace rt::literals;

const SecondThread secondThread;

rt::Ref<LUMLogMessage> messageWith(const rt::Ref<LUMLogMetadata>& metadata) {
  const rt::String text = "cannot read \"/srv/incoming/2026-07-31.csv\", line 1204"_s;
  return LUMLogMessage::initWithLevel(LUMLogLevelInfo, text, text, "Importer/Source/Importer.cpp"_s,
                                      "void Importer::importFile(const rt::String&)"_s, 120, ""_s, ""_s,
                                      nullptr, nullptr, metadata);
}

rt::Ref<LUMLogMessage> withoutFields() {
  return messageWith(LUMLogMetadata::metadataWithComponent("Importer"_s));
}

rt::Ref<LUMLogMessage> withFields() {
  return messageWith(LUMLogMetadata::metadataWithComponent("Importer"_s)
                         ->messageWithKey("user"_s, "ann"_s)
                         ->messageWithKey("path"_s, "/srv/incoming"_s)
                         ->messageWithKey("request"_s, "7d1aa2c0"_s));
}

void render(benchmark::State& state, const rt::Ref<LUMLogFormatter>& formatter,
            const rt::Ref<LUMLogMessage>& message) {
  for (auto _ : state) {
    const LUMLogRenderedLine line(*formatter, *message, "\n");
    benchmark::DoNotOptimize(line.text().data());
  }
}

void json(benchmark::State& state, rt::Ref<LUMLogMessage> (*message)()) {
  render(state, LUMLogJSON::init(), message());
}

void pattern(benchmark::State& state, rt::Ref<LUMLogMessage> (*message)()) {
  render(state, LUMLogPattern::init(), message());
}

BENCHMARK_CAPTURE(json, plain, withoutFields)->Name("JSONLine/plain/ours");
BENCHMARK_CAPTURE(pattern, plain, withoutFields)->Name("JSONLine/plain/pattern");
BENCHMARK_CAPTURE(json, fields, withFields)->Name("JSONLine/fields/ours");
BENCHMARK_CAPTURE(pattern, fields, withFields)->Name("JSONLine/fields/pattern");

const Bound plainBound("JSONLine/plain", "pattern", 1.5);
const Bound fieldsBound("JSONLine/fields", "pattern", 1.5);

}  // namespace
