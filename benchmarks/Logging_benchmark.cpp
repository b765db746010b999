// Compares logging with two common libraries. Each message has a text and a number, and ends at a logger that
// takes the formatted text.

#include <benchmark/benchmark.h>
#include <glog/logging.h>
#include <spdlog/async.h>
#include <spdlog/logger.h>
#include <spdlog/sinks/base_sink.h>

#include <array>
#include <condition_variable>
#include <cstdint>
#include <memory>
#include <mutex>
#include <span>
#include <thread>

#include "Comparison.h"
#include "Runtime/Process/Private/CallStack.h"
#include "Shared/Logging/LUMAsyncLogger.h"
#include "Shared/Logging/LUMLog.h"
#include "Shared/Logging/LUMLogMinimumLevelFilter.h"
#include "Shared/Logging/LUMLogMultiplexer.h"

namespace {

using namespace rt::literals;

constexpr const char* kName = "holiday.tar";
constexpr int kBurst = 256;

// A second thread, which waits. System libraries avoid atomic operations while a program has only one thread.
class Company {
 public:
  Company()
      : thread_([this] {
          std::unique_lock lock(mutex_);
          end_.wait(lock, [this] { return isOver_; });
        }) {}
  Company(const Company&) = delete;
  Company& operator=(const Company&) = delete;
  ~Company() {
    {
      const std::lock_guard guard(mutex_);
      isOver_ = true;
    }
    end_.notify_all();
    thread_.join();
  }

 private:
  std::mutex mutex_;
  std::condition_variable end_;
  bool isOver_ = false;
  std::thread thread_;
};

class SyncLogger final : public rt::Implements<SyncLogger, rt::Object, LUMSyncLogger> {
 public:
  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override {
    benchmark::DoNotOptimize(message->formattedString().view().data());
  }
  rt::Ref<LUMLogFilter> filter() const override { return nullptr; }
};

class AsyncLogger final : public rt::Implements<AsyncLogger, rt::Object, LUMAsyncLogger> {
 public:
  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override {
    benchmark::DoNotOptimize(message->formattedString().view().data());
  }
  rt::Ref<LUMLogFilter> filter() const override { return nullptr; }
  rt::Ref<rt::Queue> operationQueue() const override { return queue_; }
  LUMLogDispatchMode dispatchModeForMessage(const LUMLogMessage& /*message*/) const override { return 0; }
  void drain() { queue_->barrierSync(); }

 private:
  const rt::Ref<rt::Queue> queue_ = rt::make<rt::Queue>("AsyncLogger"_s);
};

// The shared multiplexer, with no loggers but those that a case adds.
class Ours {
 public:
  Ours() {
    const rt::Ref<LUMSystemLogger> replacement = LUMSystemLogger::initWithFilter(nullptr);
    multiplexer_->addSyncLogger(replacement);
    multiplexer_->removeSyncLogger(replacement);
  }
  Ours(const Ours&) = delete;
  Ours& operator=(const Ours&) = delete;
  ~Ours() {
    multiplexer_->removeSyncLogger(sync_);
    multiplexer_->removeAsyncLogger(async_);
    multiplexer_->removeLogFilter(filter_);
    multiplexer_->setCaptureCallStack(true);
  }

  void addSync() { multiplexer_->addSyncLogger(sync_); }
  void addAsync() { multiplexer_->addAsyncLogger(async_); }
  void addFilter() { multiplexer_->addLogFilter(filter_); }
  void setCaptureCallStack(bool capture) { multiplexer_->setCaptureCallStack(capture); }
  void drain() {
    multiplexer_->waitForLogging();
    async_->drain();
  }

 private:
  const rt::Ref<LUMLogMultiplexer>& multiplexer_ = LUMLogMultiplexer::sharedInstance();
  const rt::Ref<SyncLogger> sync_ = rt::make<SyncLogger>();
  const rt::Ref<AsyncLogger> async_ = rt::make<AsyncLogger>();
  const rt::Ref<LUMLogFilter> filter_ = LUMLogMinimumLevelFilter::initWithMinimumLevel(LUMLogLevelError);
};

// Takes the formatted text, as SyncLogger does.
template <class Mutex>
class Sink final : public spdlog::sinks::base_sink<Mutex> {
 protected:
  void sink_it_(const spdlog::details::log_msg& message) override {
    spdlog::memory_buf_t text;
    this->formatter_->format(message, text);
    benchmark::DoNotOptimize(text.data());
  }
  void flush_() override {}
};

using UnlockedSink = Sink<spdlog::details::null_mutex>;

std::shared_ptr<spdlog::logger> spdlogLogger() {
  auto logger = std::make_shared<spdlog::logger>("benchmark", std::make_shared<UnlockedSink>());
  logger->set_pattern("%v");
  return logger;
}

class GlogSink final : public google::LogSink {
 public:
  void send(google::LogSeverity /*severity*/, const char* /*path*/, const char* /*file*/, int /*line*/,
            const google::LogMessageTime& /*time*/, const char* message, std::size_t length) override {
    benchmark::DoNotOptimize(message + length);
  }
};

void syncOurs(benchmark::State& state) {
  const Company company;
  Ours ours;
  ours.addSync();
  int i = 0;
  for (auto _ : state) LUMLogAt(LUMLogLevelInfo, "%s has %d entries"_s, kName, ++i);
}

void syncSpdlog(benchmark::State& state) {
  const Company company;
  const auto logger = spdlogLogger();
  int i = 0;
  for (auto _ : state) {
    logger->log({__FILE__, __LINE__, __PRETTY_FUNCTION__}, spdlog::level::info, "{} has {} entries", kName,
                ++i);
  }
}

void syncGlog(benchmark::State& state) {
  const Company company;
  GlogSink sink;
  int i = 0;
  for (auto _ : state) LOG_TO_SINK_BUT_NOT_TO_LOGFILE(&sink, INFO) << kName << " has " << ++i << " entries";
}

void refusedOurs(benchmark::State& state) {
  const Company company;
  Ours ours;
  ours.addSync();
  ours.addFilter();
  int i = 0;
  for (auto _ : state) LUMLogAt(LUMLogLevelInfo, "%s has %d entries"_s, kName, ++i);
}

void refusedSpdlog(benchmark::State& state) {
  const Company company;
  const auto logger = spdlogLogger();
  logger->set_level(spdlog::level::err);
  int i = 0;
  for (auto _ : state) {
    logger->log({__FILE__, __LINE__, __PRETTY_FUNCTION__}, spdlog::level::info, "{} has {} entries", kName,
                ++i);
  }
}

// Measures the call alone. Each message is handled before the next one, so that the queue never fills.
void steadyOurs(benchmark::State& state) {
  Ours ours;
  ours.addAsync();
  int i = 0;
  for (auto _ : state) {
    LUMLogAt(LUMLogLevelInfo, "%s has %d entries"_s, kName, ++i);
    state.PauseTiming();
    ours.drain();
    state.ResumeTiming();
  }
}

// Measures a burst of messages until the logger has taken the last one.
void burstOurs(benchmark::State& state) {
  Ours ours;
  ours.addAsync();
  for (auto _ : state) {
    for (int i = 0; i < kBurst; ++i) LUMLogAt(LUMLogLevelInfo, "%s has %d entries"_s, kName, i);
    ours.drain();
  }
}

// Counts its messages, so that the end of a burst is known.
class CountingSink final : public spdlog::sinks::base_sink<spdlog::details::null_mutex> {
 public:
  void waitFor(std::uint64_t count) const {
    for (std::uint64_t seen = count_.load(); seen != count; seen = count_.load()) count_.wait(seen);
  }

 protected:
  void sink_it_(const spdlog::details::log_msg& message) override {
    spdlog::memory_buf_t text;
    formatter_->format(message, text);
    benchmark::DoNotOptimize(text.data());
    count_.fetch_add(1);
    count_.notify_all();
  }
  void flush_() override {}

 private:
  std::atomic<std::uint64_t> count_{0};
};

class SpdlogAsync {
 public:
  SpdlogAsync() { logger_->set_pattern("%v"); }

  void log(int i) {
    ++count_;
    logger_->log({__FILE__, __LINE__, __PRETTY_FUNCTION__}, spdlog::level::info, "{} has {} entries", kName,
                 i);
  }
  void drain() { sink_->waitFor(count_); }

 private:
  std::uint64_t count_ = 0;
  std::shared_ptr<CountingSink> sink_ = std::make_shared<CountingSink>();
  std::shared_ptr<spdlog::details::thread_pool> pool_ =
      std::make_shared<spdlog::details::thread_pool>(8192, 1);
  std::shared_ptr<spdlog::async_logger> logger_ =
      std::make_shared<spdlog::async_logger>("benchmark", sink_, pool_, spdlog::async_overflow_policy::block);
};

void steadySpdlog(benchmark::State& state) {
  SpdlogAsync logger;
  int i = 0;
  for (auto _ : state) {
    logger.log(++i);
    state.PauseTiming();
    logger.drain();
    state.ResumeTiming();
  }
}

void burstSpdlog(benchmark::State& state) {
  SpdlogAsync logger;
  for (auto _ : state) {
    for (int i = 0; i < kBurst; ++i) logger.log(i);
    logger.drain();
  }
}

constexpr int kMessagesPerThread = 2000;

template <class Log>
void onTwoThreads(Log log) {
  std::thread other([&] {
    for (int i = 0; i < kMessagesPerThread; ++i) log(i);
  });
  for (int i = 0; i < kMessagesPerThread; ++i) log(i);
  other.join();
}

void twoThreadsOurs(benchmark::State& state) {
  Ours ours;
  ours.addSync();
  for (auto _ : state) {
    onTwoThreads([](int i) { LUMLogAt(LUMLogLevelInfo, "%s has %d entries"_s, kName, i); });
  }
}

void twoThreadsSpdlog(benchmark::State& state) {
  const auto logger = spdlogLogger();
  for (auto _ : state) {
    onTwoThreads([&](int i) {
      logger->log({__FILE__, __LINE__, __PRETTY_FUNCTION__}, spdlog::level::info, "{} has {} entries", kName,
                  i);
    });
  }
}

void errorOurs(benchmark::State& state, bool capture) {
  const Company company;
  Ours ours;
  ours.addSync();
  ours.setCaptureCallStack(capture);
  int i = 0;
  for (auto _ : state) LUMLogAt(LUMLogLevelError, "%s has %d entries"_s, kName, ++i);
}

// The number of frames between a call of LUMLogAt and the unwinder.
constexpr int kFrames = 4;

[[gnu::noinline]] std::size_t captureBehind(int frames, std::span<std::uint64_t> addresses) {
  const std::size_t count =
      frames > 1 ? captureBehind(frames - 1, addresses) : rt::CallStack::capture(addresses);
  rt::CallStack::keepFrame();
  return count;
}

// Measures the unwinder alone, as deep as it is when an error with a call stack is logged.
void unwinder(benchmark::State& state) {
  const Company company;
  std::array<std::uint64_t, 128> addresses{};
  for (auto _ : state) benchmark::DoNotOptimize(captureBehind(kFrames, addresses));
}

BENCHMARK(syncOurs)->Name("Logging/sync/ours");
BENCHMARK(syncSpdlog)->Name("Logging/sync/spdlog");
BENCHMARK(syncGlog)->Name("Logging/sync/glog");
BENCHMARK(refusedOurs)->Name("Logging/refused/ours");
BENCHMARK(refusedSpdlog)->Name("Logging/refused/spdlog");
BENCHMARK(steadyOurs)->Name("Logging/async-steady/ours")->Iterations(5000);
BENCHMARK(steadySpdlog)->Name("Logging/async-steady/spdlog")->Iterations(5000);
BENCHMARK(burstOurs)->Name("Logging/async-burst/ours")->UseRealTime();
BENCHMARK(burstSpdlog)->Name("Logging/async-burst/spdlog")->UseRealTime();
BENCHMARK(twoThreadsOurs)->Name("Logging/two-threads/ours")->UseRealTime();
BENCHMARK(twoThreadsSpdlog)->Name("Logging/two-threads/spdlog")->UseRealTime();
BENCHMARK_CAPTURE(errorOurs, , true)->Name("Logging/error with call stack/ours");
BENCHMARK_CAPTURE(errorOurs, , false)->Name("Logging/error with call stack/without");
BENCHMARK(unwinder)->Name("Logging/error with call stack/unwinder");

const Bound syncBound("Logging/sync", "spdlog", 1.5);
const Bound refusedBound("Logging/refused", "spdlog", 1.0);
const Bound glogBound("Logging/sync", "glog", 1.0);

}  // namespace
