// Compares a line of JSON with a line of text that has the same parts, for one message with and one without
// fields. Rendering a line includes finding a place for it.

#include <benchmark/benchmark.h>

#include <ctime>
#include <string_view>

#include "Comparison.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMLogMessage.h"
#include "Shared/Logging/Loggers/LUMLogJSON.h"
#include "Shared/Logging/Loggers/LUMLogLineFormatter.h"
#include "Shared/Logging/Loggers/Private/LUMLogFields.h"
#include "Shared/Logging/Loggers/Private/LUMLogRenderedLine.h"

namespace {

using namespace rt::literals;

const SecondThread secondThread;

// "2026-11-22 21:59:14.123 info  [Importer] 4711 Importer.cpp:120 text bytes=42 user=ann". The second of the
// last line is kept.
class Text final : public rt::Implements<Text, rt::Object, LUMLogLineFormatter> {
 public:
  void appendLine(LUMLogLine& line, const LUMLogMessage& message) const override {
    static thread_local std::time_t knownSecond = -1;
    static thread_local std::tm parts{};
    constexpr std::int64_t kNanoseconds = 1'000'000'000;
    const std::time_t second = message.time() / kNanoseconds;
    if (second != knownSecond) localtime_r(&second, &parts);
    knownSecond = second;
    line.appendUnsigned(static_cast<std::uint64_t>(parts.tm_year) + 1900);
    const auto part = [&](char separator, int value) {
      line.append(separator);
      line.appendUnsigned(static_cast<std::uint64_t>(value), 2);
    };
    part('-', parts.tm_mon + 1);
    part('-', parts.tm_mday);
    part(' ', parts.tm_hour);
    part(':', parts.tm_min);
    part(':', parts.tm_sec);
    line.append('.');
    line.appendUnsigned(static_cast<std::uint64_t>(message.time() % kNanoseconds) / 1'000'000, 3);
    line.append(message.level() == LUMLogLevelInfo ? " info  " : " other ");
    if (message.logMetadata()) {
      if (const rt::Object* component =
              message.logMetadata()->properties()->objectForKey(LUMLogMetadata::kComponentKey)) {
        line.append('[');
        line.withTextOf(component, [&](std::string_view text) { line.appendEscaped(text); });
        line.append("] ");
      }
    }
    line.appendUnsigned(message.threadIdentifier());
    line.append(' ');
    line.appendEscaped(message.file().view().substr(message.file().view().rfind('/') + 1));
    line.append(':');
    line.appendUnsigned(message.line());
    line.append(' ');
    line.appendEscaped(message.formattedString());
    for (LUMLogFields fields(message.logMetadata().get()); !fields.isAtEnd(); fields.advance()) {
      line.append(' ');
      line.appendEscaped(fields.name());
      line.append('=');
      line.withTextOf(&fields.value(), [&](std::string_view text) { line.appendEscaped(text); });
    }
  }
};

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

void text(benchmark::State& state, rt::Ref<LUMLogMessage> (*message)()) {
  render(state, rt::make<Text>(), message());
}

BENCHMARK_CAPTURE(json, plain, withoutFields)->Name("JSONLine/plain/ours");
BENCHMARK_CAPTURE(text, plain, withoutFields)->Name("JSONLine/plain/text line");
BENCHMARK_CAPTURE(json, fields, withFields)->Name("JSONLine/fields/ours");
BENCHMARK_CAPTURE(text, fields, withFields)->Name("JSONLine/fields/text line");

const Bound plainBound("JSONLine/plain", "text line", 1.5);
const Bound fieldsBound("JSONLine/fields", "text line", 1.5);

}  // namespace
