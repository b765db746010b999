// Compares a line of the older logger with one of spdlog. Both have the same fields: the local time in
// milliseconds, the process, the thread, the level, the function and a message with two arguments. One case
// drops the line, and so measures the formatting alone. The other writes it to /dev/null.
#include <benchmark/benchmark.h>
#include <spdlog/logger.h>
#include <spdlog/sinks/base_sink.h>
#include <spdlog/sinks/basic_file_sink.h>

#include <memory>
#include <string>

#include "Comparison.h"
#include "Foundation/ZEBFileHandleLogWriter.h"
#include "Foundation/ZEBLogNoFilter.h"
#include "Foundation/ZEBLogStandardFormatter.h"
#include "Foundation/ZEBLogger.h"

namespace {

using namespace rt::literals;

class DroppingWriter final : public rt::Implements<DroppingWriter, rt::Object, ZEBLogWriter> {
 public:
  void logMessage(const rt::String& message, ZEBLogLevel /*level*/) override {
    benchmark::DoNotOptimize(message.view().data());
  }
};

// Drops the line like spdlog's null sink, but formats it first.
class DroppingSink final : public spdlog::sinks::base_sink<spdlog::details::null_mutex> {
 protected:
  void sink_it_(const spdlog::details::log_msg& message) override {
    spdlog::memory_buf_t line;
    formatter_->format(message, line);
    benchmark::DoNotOptimize(line.data());
  }
  void flush_() override {}
};

rt::Ref<ZEBLogger> loggerWithWriter(rt::Ref<ZEBLogWriter> writer) {
  return ZEBLogger::loggerWithWriter(std::move(writer), ZEBLogStandardFormatter::init(), nullptr);
}

spdlog::logger peerWithSink(spdlog::sink_ptr sink) {
  spdlog::logger logger("benchmark", std::move(sink));
  logger.set_pattern("%Y-%m-%d %H:%M:%S.%e %n[%P/%t] [lvl=%l] %! %v");
  logger.flush_on(spdlog::level::trace);
  return logger;
}

const rt::String kName = rt::String::fromUTF8("first.txt");

void log(benchmark::State& state, ZEBLogger& logger) {
  int value = 12345;
  for (auto _ : state) {
    benchmark::DoNotOptimize(value);
    logger.logFuncError("importFile", "%@ has %d entries"_s, kName, value);
  }
}

void logToPeer(benchmark::State& state, spdlog::logger& logger) {
  const std::string name(kName.view());
  int value = 12345;
  for (auto _ : state) {
    benchmark::DoNotOptimize(value);
    logger.log(spdlog::source_loc{"import.cpp", 1, "importFile"}, spdlog::level::err, "{} has {} entries",
               name, value);
  }
}

void dropped(benchmark::State& state) {
  log(state, *loggerWithWriter(rt::make<DroppingWriter>()));
}

void droppedByPeer(benchmark::State& state) {
  spdlog::logger peer = peerWithSink(std::make_shared<DroppingSink>());
  logToPeer(state, peer);
}

void written(benchmark::State& state) {
  log(state, *loggerWithWriter(ZEBFileHandleLogWriter::fileHandleForLoggingAtPath("/dev/null"_s, 0644)));
}

void writtenByPeer(benchmark::State& state) {
  spdlog::logger peer = peerWithSink(std::make_shared<spdlog::sinks::basic_file_sink_mt>("/dev/null"));
  logToPeer(state, peer);
}

BENCHMARK(dropped)->Name("OlderLogger/dropped/ours");
BENCHMARK(droppedByPeer)->Name("OlderLogger/dropped/spdlog");
BENCHMARK(written)->Name("OlderLogger/written/ours");
BENCHMARK(writtenByPeer)->Name("OlderLogger/written/spdlog");

const Bound droppedBound("OlderLogger/dropped", "spdlog", 1.0);
const Bound writtenBound("OlderLogger/written", "spdlog", 1.0);

}  // namespace
