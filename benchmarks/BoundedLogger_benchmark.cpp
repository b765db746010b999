// Compares asynchronous logging with a common library, whose pool has its default size and one thread. Both
// queues have 8192 places and block when they are full. Each message has a text and a number, and ends at a
// logger that takes the formatted text.

#include <benchmark/benchmark.h>
#include <spdlog/async.h>
#include <spdlog/sinks/base_sink.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <memory>
#include <vector>

#include "Comparison.h"
#include "Shared/Logging/LUMLog.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/LUMSystemLogger.h"
#include "Shared/Logging/Loggers/LUMBoundedLogger.h"

namespace {

using namespace rt::literals;
using Clock = std::chrono::steady_clock;

constexpr const char* kName = "holiday.tar";
constexpr int kSteadyMessages = 4000;
constexpr int kBurst = 10'000;
constexpr std::uint32_t kLong = 600'000;

class Sink final : public rt::Implements<Sink, LUMLogOutput> {
 public:
  Sink() : Implements(nullptr) {}
  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override {
    benchmark::DoNotOptimize(message->formattedString().view().data());
  }
};

class Ours {
 public:
  Ours() {
    const rt::Ref<LUMSystemLogger> replacement = LUMSystemLogger::initWithFilter(nullptr);
    multiplexer_->addSyncLogger(replacement);
    multiplexer_->removeSyncLogger(replacement);
    multiplexer_->addSyncLogger(logger_);
  }
  Ours(const Ours&) = delete;
  Ours& operator=(const Ours&) = delete;
  ~Ours() { multiplexer_->removeSyncLogger(logger_); }

  static void log(int i) { LUMLogAt(LUMLogLevelInfo, "%s has %d entries"_s, kName, i); }
  void drain() { logger_->flush(kLong); }

 private:
  const rt::Ref<LUMLogMultiplexer>& multiplexer_ = LUMLogMultiplexer::sharedInstance();
  const rt::Ref<LUMBoundedLogger> logger_ = LUMBoundedLogger::initWithLogger(rt::make<Sink>());
};

class Spdlog {
 public:
  Spdlog() { logger_->set_pattern("%v"); }

  void log(int i) {
    logger_->log({__FILE__, __LINE__, __PRETTY_FUNCTION__}, spdlog::level::info, "{} has {} entries", kName,
                 i);
  }
  void drain() {
    sink_->isFlushed = false;
    logger_->flush();
    sink_->isFlushed.wait(false);
  }

 private:
  class FormattingSink final : public spdlog::sinks::base_sink<spdlog::details::null_mutex> {
   public:
    std::atomic<bool> isFlushed = false;

   protected:
    void sink_it_(const spdlog::details::log_msg& message) override {
      spdlog::memory_buf_t text;
      formatter_->format(message, text);
      benchmark::DoNotOptimize(text.data());
    }
    void flush_() override {
      isFlushed = true;
      isFlushed.notify_all();
    }
  };

  std::shared_ptr<FormattingSink> sink_ = std::make_shared<FormattingSink>();
  std::shared_ptr<spdlog::details::thread_pool> pool_ =
      std::make_shared<spdlog::details::thread_pool>(spdlog::details::default_async_q_size, 1);
  std::shared_ptr<spdlog::async_logger> logger_ =
      std::make_shared<spdlog::async_logger>("benchmark", sink_, pool_, spdlog::async_overflow_policy::block);
};

// Measures the time that one call takes, if a message comes every 50 microseconds. An iteration is the
// percentile of many calls.
template <class Logger>
void steady(benchmark::State& state, double percentile) {
  Logger logger;
  std::vector<double> times(kSteadyMessages);
  for (auto _ : state) {
    Clock::time_point next = Clock::now();
    for (int i = 0; i < kSteadyMessages; ++i) {
      next += std::chrono::microseconds(50);
      while (Clock::now() < next) {
      }
      const Clock::time_point start = Clock::now();
      logger.log(i);
      times[static_cast<std::size_t>(i)] = std::chrono::duration<double>(Clock::now() - start).count();
    }
    const auto nth = times.begin() + static_cast<std::ptrdiff_t>(percentile * kSteadyMessages);
    std::ranges::nth_element(times, nth);
    state.SetIterationTime(*nth);
  }
  logger.drain();
}

void steadyOurs(benchmark::State& state, double percentile) {
  steady<Ours>(state, percentile);
}

void steadySpdlog(benchmark::State& state, double percentile) {
  steady<Spdlog>(state, percentile);
}

// Measures a burst of messages until the last one is written.
template <class Logger>
void burst(benchmark::State& state) {
  Logger logger;
  for (auto _ : state) {
    for (int i = 0; i < kBurst; ++i) logger.log(i);
    logger.drain();
  }
}

BENCHMARK_CAPTURE(steadyOurs, , 0.5)
    ->Name("BoundedLogger/every 50 us, p50/ours")
    ->Iterations(1)
    ->UseManualTime();
BENCHMARK_CAPTURE(steadySpdlog, , 0.5)
    ->Name("BoundedLogger/every 50 us, p50/spdlog")
    ->Iterations(1)
    ->UseManualTime();
BENCHMARK_CAPTURE(steadyOurs, , 0.99)
    ->Name("BoundedLogger/every 50 us, p99/ours")
    ->Iterations(1)
    ->UseManualTime();
BENCHMARK_CAPTURE(steadySpdlog, , 0.99)
    ->Name("BoundedLogger/every 50 us, p99/spdlog")
    ->Iterations(1)
    ->UseManualTime();
BENCHMARK(burst<Ours>)->Name("BoundedLogger/burst/ours")->UseRealTime();
BENCHMARK(burst<Spdlog>)->Name("BoundedLogger/burst/spdlog")->UseRealTime();

// A busy machine stretches the two last ones: the goals are 0.2 and 0.5.
const Bound p50Bound("BoundedLogger/every 50 us, p50", "spdlog", 0.1);
const Bound p99Bound("BoundedLogger/every 50 us, p99", "spdlog", 0.3);
const Bound burstBound("BoundedLogger/burst", "spdlog", 1.0);

}  // namespace
