// Compares a line to a file with a common library: the same pattern, the same fields, the time taken in both.
//
// Its file sink for several threads ("mt") is comparable, since our logger has a lock, too. The sink without
// a lock ("st") is there to show what the lock costs. The sinks write by the C library's stream, in pieces of
// 4 KB, so ours has a buffer of that size. It also has the size that the documentation proposes.

#include <benchmark/benchmark.h>
#include <spdlog/logger.h>
#include <spdlog/sinks/basic_file_sink.h>
#include <unistd.h>

#include <array>
#include <cstddef>
#include <cstdio>
#include <filesystem>
#include <memory>
#include <string>

#include "Comparison.h"
#include "Shared/Logging/LUMLog.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/LUMSystemLogger.h"
#include "Shared/Logging/Loggers/LUMFileLogger.h"
#include "Shared/Logging/Loggers/LUMLogPattern.h"

namespace {

using namespace rt::literals;

const SecondThread secondThread;

constexpr const char* kName = "holiday.tar";
constexpr std::size_t kStreamBuffer = 4096;
constexpr std::size_t kLargeBuffer = 65'536;

// A file in memory, so that no disk is measured. It is removed at the end.
class File {
 public:
  File() : path_(folder() + "/FileLogger_benchmark." + std::to_string(getpid())) {}
  File(const File&) = delete;
  File& operator=(const File&) = delete;
  ~File() { std::remove(path_.c_str()); }
  const std::string& path() const { return path_; }

 private:
  static std::string folder() {
    return std::filesystem::is_directory("/dev/shm") ? "/dev/shm"
                                                     : std::filesystem::temp_directory_path().string();
  }
  const std::string path_;
};

rt::Ref<LUMLogPattern> pattern() {
  return LUMLogPattern::initWithPattern(
      "{time:%Y-%m-%d %H:%M:%S.%3f} {level:<5} [{component}] {tid} {file}:{line} {text}"_s);
}

void lineOurs(benchmark::State& state, std::size_t bufferSize) {
  const File file;
  LUMFileLoggerOptions options;
  options.formatter = pattern();
  options.bufferSize = bufferSize;
  const rt::Ref<LUMFileLogger> logger =
      LUMFileLogger::initWithPath(rt::String::fromUTF8(file.path()), options);
  // Replaces the default system logger.
  const rt::Ref<LUMSystemLogger> replacement = LUMSystemLogger::initWithFilter(nullptr);
  const rt::Ref<LUMLogMultiplexer>& multiplexer = LUMLogMultiplexer::sharedInstance();
  multiplexer->addSyncLogger(replacement);
  multiplexer->removeSyncLogger(replacement);
  multiplexer->addSyncLogger(logger);
  const rt::Ref<LUMLogMetadata> importer = LUMLogMetadata::metadataWithComponent("Importer"_s);
  int i = 0;
  for (auto _ : state) LUMLogAt(LUMLogLevelInfo, importer, "%s has %d entries"_s, kName, ++i);
  multiplexer->removeSyncLogger(logger);
}

// Renders only: what is left of a line without its message, the multiplexer and the file.
void patternOurs(benchmark::State& state) {
  const rt::Ref<LUMLogPattern> formatter = pattern();
  const rt::Ref<LUMLogMetadata> importer = LUMLogMetadata::metadataWithComponent("Importer"_s);
  const rt::Ref<LUMLogMessage> message = LUMLogMessage::initWithLevel(
      LUMLogLevelInfo, "text"_s, "holiday.tar has 12345 entries"_s, "/a/b/FileLogger_benchmark.cpp"_s,
      "void f()"_s, 42, nullptr, nullptr, nullptr, nullptr, importer);
  std::array<char, 2048> place{};
  for (auto _ : state) {
    LUMLogLine line(place);
    formatter->appendLine(line, *message);
    benchmark::DoNotOptimize(place);
  }
}

template <class Sink>
void lineSpdlog(benchmark::State& state, bool flushes) {
  const File file;
  spdlog::logger logger("Importer", std::make_shared<Sink>(file.path(), true));
  logger.set_pattern("%Y-%m-%d %H:%M:%S.%e %-5l [%n] %t %s:%# %v");
  if (flushes) logger.flush_on(spdlog::level::info);
  int i = 0;
  for (auto _ : state) {
    logger.log({__FILE__, __LINE__, __PRETTY_FUNCTION__}, spdlog::level::info, "{} has {} entries", kName,
               ++i);
  }
}

constexpr auto lineLocked = lineSpdlog<spdlog::sinks::basic_file_sink_mt>;
constexpr auto lineUnlocked = lineSpdlog<spdlog::sinks::basic_file_sink_st>;

BENCHMARK_CAPTURE(lineOurs, , kStreamBuffer)->Name("FileLogger/line/ours");
BENCHMARK_CAPTURE(lineLocked, , false)->Name("FileLogger/line/spdlog-mt");
BENCHMARK_CAPTURE(lineUnlocked, , false)->Name("FileLogger/line/spdlog-st");
BENCHMARK_CAPTURE(lineOurs, , kLargeBuffer)->Name("FileLogger/line, 64 KB/ours");
BENCHMARK_CAPTURE(lineLocked, , false)->Name("FileLogger/line, 64 KB/spdlog-mt");
BENCHMARK_CAPTURE(lineOurs, , std::size_t{0})->Name("FileLogger/line at once/ours");
BENCHMARK_CAPTURE(lineLocked, , true)->Name("FileLogger/line at once/spdlog-mt");
BENCHMARK(patternOurs)->Name("FileLogger/pattern/ours");

const Bound lineBound("FileLogger/line, 64 KB", "spdlog-mt", 1.1);

}  // namespace
