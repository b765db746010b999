// Forks a process with many threads. In the child, no lock stays held, and all libraries can be used.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cstdlib>
#include <filesystem>
#include <functional>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "Foundation/ZEBArrayCompositeLogWriter.h"
#include "Foundation/ZEBLogStandardFormatter.h"
#include "Libraries/Util/ErrorHandler/PECErrorHandler.h"
#include "Libraries/Util/ErrorHandler/PECReport.h"
#include "Runtime/Defaults/UserDefaults.h"
#include "Runtime/Process/FileHandle.h"
#include "Runtime/Queues/MainQueue.h"
#include "Runtime/Queues/Queue.h"
#include "Runtime/Values/Array.h"
#include "Shared/Logging/LUMLog.h"
#include "Shared/Logging/LUMLogDropAllFilter.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/LUMLogNoFilter.h"
#include "Shared/ServiceRegistry/ServiceRegistry.h"
#include "tests/support/ForkTest.h"
#include "tests/support/SettingsFile.h"
#include "tests/support/TestServices.h"
#include "tests/support/ZEBLoggerTest.h"

namespace {

using namespace rt::literals;
using namespace TestServices;
using rt::Ref;

/// A place in which a thread waits until it is told to leave. Other threads can wait until it has arrived.
class Parking {
 public:
  /// Waits until `end` is called.
  void park() {
    isTaken_ = true;
    isTaken_.notify_one();
    mayLeave_.wait(false);
  }
  void awaitSomebody() const { isTaken_.wait(false); }
  void end() {
    mayLeave_ = true;
    mayLeave_.notify_all();
  }

 private:
  std::atomic<bool> isTaken_ = false;
  std::atomic<bool> mayLeave_ = false;
};

/// Runs `work`, which parks, on a new thread. The constructor returns when that thread has parked.
class ParkedThread {
 public:
  ParkedThread(Parking& parking, std::function<void()> work) : parking_(parking), thread_(std::move(work)) {
    parking_.awaitSomebody();
  }
  ParkedThread(const ParkedThread&) = delete;
  ParkedThread& operator=(const ParkedThread&) = delete;
  ~ParkedThread() { end(); }

  void end() {
    parking_.end();
    if (thread_.joinable()) thread_.join();
  }

 private:
  Parking& parking_;
  std::thread thread_;
};

constinit std::atomic<int> heard = 0;

class CountingLogger final : public rt::Implements<CountingLogger, rt::Object, LUMSyncLogger> {
 public:
  void logWithMessage(const Ref<LUMLogMessage>& /*message*/) override { ++heard; }
  Ref<LUMLogFilter> filter() const override { return nullptr; }
};

void report() {
  PECReport({"Forks_test", "report"}, "reported"_s);
}

void log(LUMLogLevel level) {
  LUMLogAt(level, "logged %d"_s, 1);
}

class Forks : public ZEBLoggerTest {
 protected:
  Forks() {
    // Keeps the messages of the tests out of the system's log.
    LUMLogMultiplexer::sharedInstance()->addSyncLogger(
        LUMSystemLogger::initWithFilter(LUMLogDropAllFilter::init()));
    LUMLogMultiplexer::sharedInstance()->addSyncLogger(logger_);
    PECErrorHandler::sharedInstance()->setErrorHandlerBlock([](const Ref<PECErrorDescription>&) {});
    registry_->internalRegisterBindings(std::array{&kModule});
    before_ = SRLRegistry::setSharedInstance(registry_);
    ZEBLogger::setSharedLogger(newLogger());
  }
  ~Forks() override {
    SRLRegistry::setSharedInstance(before_);
    LUMLogMultiplexer::sharedInstance()->removeSyncLogger(logger_);
    PECErrorHandler::resetAfterTest();
  }

  Ref<ZEBLogger> newLogger() const {
    return ZEBLogger::loggerWithWriter(ZEBFileHandleLogWriter::initWithFileHandle(file_),
                                       ZEBLogStandardFormatter::init(), nullptr);
  }

  const Ref<SRLRegistry> registry_ = SRLRegistry::initPrivate();
  const Ref<rt::FileHandle> file_ = rt::FileHandle::openForAppending(pathText(), 0600);
  const Ref<rt::Queue> queue_ = rt::make<rt::Queue>("Forks"_s);

 private:
  const Ref<CountingLogger> logger_ = rt::make<CountingLogger>();
  Ref<SRLRegistry> before_;
};

/// A tag with the default hash.
class Tag final : public rt::Implements<Tag, rt::Object> {};

/// A tag whose `hash` parks.
class SlowTag final : public rt::Implements<SlowTag, rt::Object> {
 public:
  explicit SlowTag(Parking& parking) : parking_(parking) {}
  std::uint64_t hash() const override {
    parking_.park();
    return 1;
  }

 private:
  Parking& parking_;
};

// In each of these tests, another thread parks while it holds a lock. Then the process forks.

TEST_F(Forks, ChildMakesAnInstanceThatAnotherThreadWasMaking) {
  const Ref<SRLMemoizingScope> scope = registry_->scopeWithTags({});
  static constexpr char kPlace = 0;
  Parking parking;
  const Ref<rt::Object> ofParent = rt::make<Tag>();
  Ref<rt::Object> made;
  ParkedThread maker(parking, [&] {
    made = scope->instanceForIdentifier(&kPlace, nullptr, [&] {
      parking.park();
      return ofParent;  // NOLINT(performance-no-automatic-move): nothing moves it from there
    });
  });
  EXPECT_EQ(statusOfChild([&] {
              const Ref<rt::Object> ofChild = rt::make<Tag>();
              bool isCreated = false;
              // NOLINTNEXTLINE(performance-no-automatic-move): nothing moves it from there
              const auto factory = [&] { return ofChild; };
              if (scope->instanceForIdentifier(&kPlace, &isCreated, factory) != ofChild) return 1;
              if (!isCreated) return 2;
              const auto mustNotRun = []() -> Ref<rt::Object> { _exit(3); };
              if (scope->instanceForIdentifier(&kPlace, nullptr, mustNotRun) != ofChild) return 4;
              return scope->instances()->count() == 1 ? 0 : 5;
            }),
            0);
  maker.end();
  EXPECT_EQ(made, ofParent);
}

// In the child, one thread makes the instance, and the other requesting threads wait for it.
TEST_F(Forks, ThreadsOfTheChildMakeAnInterruptedInstanceOnce) {
  if (RT_TEST_THREAD_SANITIZER) GTEST_SKIP() << "the sanitizer allows no new threads in the child";
  const Ref<SRLMemoizingScope> scope = registry_->scopeWithTags({});
  static constexpr char kPlace = 0;
  Parking parking;
  const ParkedThread maker(parking, [&] {
    scope->instanceForIdentifier(&kPlace, nullptr, [&] {
      parking.park();
      return rt::make<Tag>();
    });
  });
  EXPECT_EQ(statusOfChild([&] {
              std::atomic<int> calls = 0;
              std::array<std::thread, 4> threads;
              for (std::thread& each : threads) {
                each = std::thread([&] {
                  scope->instanceForIdentifier(&kPlace, nullptr, [&] {
                    ++calls;
                    std::this_thread::yield();
                    return rt::make<Tag>();
                  });
                });
              }
              for (std::thread& each : threads) each.join();
              return calls == 1 ? 0 : 1;
            }),
            0);
}

TEST_F(Forks, ChildReportsErrorsWhileAnotherThreadRunsTheCallback) {
  Parking parking;
  PECErrorHandler::sharedInstance()->setErrorHandlerBlock(
      [&](const Ref<PECErrorDescription>&) { parking.park(); });
  const ParkedThread reporter(parking, report);
  EXPECT_EQ(statusOfChild([&] {
              static int called = 0;
              PECErrorHandler::sharedInstance()->setErrorHandlerBlock(
                  [](const Ref<PECErrorDescription>&) { ++called; });
              report();
              report();
              return called == 2 ? 0 : 1;
            }),
            0);
}

TEST_F(Forks, ChildSetsAFilterWhileAnotherThreadSetsOne) {
  Parking parking;
  const auto filter = rt::make<FunctionFilter>();
  filter->attached = [&] { parking.park(); };
  const Ref<ZEBLogger> logger = newLogger();
  const ParkedThread setter(parking, [&] { logger->setFilter(filter); });
  EXPECT_EQ(statusOfChild([&] {
              logger->setFilter(nullptr);
              const auto recorder = rt::make<Recorder>();
              logger->setWriter(recorder);
              logger->logError("line"_s);
              return recorder->lines().size() == 1 ? 0 : 1;
            }),
            0);
}

TEST_F(Forks, ChildUsesACompositeWriterWhileAnotherThreadDoes) {
  Parking parking;
  const auto recorder = rt::make<Recorder>();
  const auto parent = rt::make<FunctionWriter>([&, thread = std::this_thread::get_id()](const rt::String&) {
    if (std::this_thread::get_id() != thread) parking.park();
  });
  const auto writers = ZEBArrayCompositeLogWriter::of(parent, recorder);
  const ParkedThread writer(parking, [&] { writers->logMessage("line"_s, ZEBLogLevelError); });
  EXPECT_EQ(statusOfChild([&] {
              writers->logMessage("line"_s, ZEBLogLevelError);
              return recorder->lines().size() == 1 ? 0 : 1;
            }),
            0);
}

// The other thread blocks in the middle of a line, because nobody reads its pipe.
TEST_F(Forks, ChildWritesALineWhileAnotherThreadWritesOne) {
  std::array<int, 2> ends{};
  ASSERT_EQ(pipe(ends.data()), 0);
  const auto handle = rt::make<rt::FileHandle>(ends[1], rt::FileHandle::Closing::closes);
  const std::string line(1'000'000, 'x');
  std::thread writer([&] { handle->writeLine(line); });
  char first = 0;
  ASSERT_EQ(read(ends[0], &first, 1), 1);
  EXPECT_EQ(statusOfChild([&] {
              const int file = open(path("child").c_str(), O_WRONLY | O_CREAT, 0600);
              if (file < 0 || dup2(file, ends[1]) != ends[1]) return 1;
              handle->writeLine("line");
              return 0;
            }),
            0);
  EXPECT_EQ(std::filesystem::file_size(path("child")), 5U);
  std::array<char, 65536> rest{};
  for (std::size_t left = line.size(); left > 0;) {
    const ssize_t count = read(ends[0], rest.data(), std::min(left, rest.size()));
    ASSERT_GT(count, 0);
    left -= static_cast<std::size_t>(count);
  }
  writer.join();
  close(ends[0]);
}

TEST_F(Forks, ChildFindsAServiceWhileAnotherThreadHashesATag) {
  // The other thread holds the registry's lock. The fork waits for it only for a limited time.
  if (RT_TEST_IS_APPLE) GTEST_SKIP() << "on macOS, the lock stays held in the child";
  Parking parking;
  const Ref<rt::Object> slow = rt::make<SlowTag>(parking);
  const Ref<rt::Object> tag = rt::make<Tag>();
  const ParkedThread asker(parking, [&] { registry_->internalService(&scopedAPI, tagSet(slow, tag)); });
  EXPECT_EQ(statusOfChild([&] { return registry_->internalService(&scopedAPI, tagSet(tag, tag)) ? 0 : 1; }),
            0);
}

TEST_F(Forks, DefaultsAreReadThoughAnotherThreadIsInAnObserver) {
  const auto defaults = rt::UserDefaults::initWithPath(pathText("defaults"));
  Parking parking;
  auto observation = defaults->observe("key", rt::UserDefaults::Notify::kOnChange, [&] { parking.park(); });
  SettingsFile(path("defaults")).set("key", "a");
  parking.awaitSomebody();
  EXPECT_EQ(statusOfChild([&] {
              observation.remove();
              return defaults->stringForKey("key") == "a" ? 0 : 1;
            }),
            0);
  parking.end();
  observation.remove();
}

// Eight threads are busy while the process makes a thousand children.

class BusyForks : public Forks {
 protected:
  BusyForks() {
    const std::array<std::function<void()>, kThreads> works{[this] { resolve(0); },
                                                            [this] { resolve(1); },
                                                            [this] { removeScopes(); },
                                                            logMessages,
                                                            [this] { changeLoggers(); },
                                                            logLines,
                                                            setPieces,
                                                            [this] { writeAndQueue(); }};
    for (const auto& work : works) {
      threads_.emplace_back([this, work] {
        while (!isEnding_) {
          isBusy_.wait(false);
          work();
          ++rounds_;
        }
      });
    }
  }
  ~BusyForks() override {
    isEnding_ = true;
    beBusy(true);
    for (std::thread& each : threads_) each.join();
  }

  /// Makes the threads work or wait. While they wait, the children have the processors.
  void beBusy(bool isBusy) {
    isBusy_ = isBusy;
    isBusy_.notify_all();
  }

  /// Uses the libraries in a child. Returns 0 if everything worked.
  int useAll() {
    const Ref<rt::Object>& tag = tags_[0];
    const Ref<rt::Object> own = rt::make<Tag>();
    const Ref<rt::Object> service = registry_->internalService(&scopedAPI, tagSet(tag, own));
    if (!service || SRLRegistry::sharedInstance()->internalService(&scopedAPI, tagSet(tag, own)) != service)
      return 1;
    if (!registry_->internalService(&nestedAPI, tagSet(tag, tags_[1]))) return 2;
    if (!registry_->internalService(&globalAPI, {})) return 3;
    if (registry_->internalMultiBoundService(&manyAPI, tagSet(tag, own))->count() != 2) return 4;
    const int before = heard;
    log(LUMLogLevelInfo);
    log(LUMLogLevelError);
    report();
    if (heard != before + 3) return 5;
    return 0;
  }

  int useLoggersAndQueues() {
    ZEBLogger::sharedLogger()->logError("child"_s);
    const auto recorder = rt::make<Recorder>();
    ZEBLogger::sharedLogger()->setWriter(recorder);
    ZEBLogger::sharedLogger()->setFilter(nullptr);
    ZEBLogger::sharedLogger()->logError("child"_s);
    if (recorder->lines().size() != 1) return 11;
    ZEBLogger::setSharedLogger(newLogger());
    LUMLogMultiplexer::sharedInstance()->addLogFilter(LUMLogNoFilter::init());
    LUMLogMultiplexer::sharedInstance()->waitForLogging();
    file_->writeLine("child");
    if (queue_->sync([] { return 12; }) != 12) return 13;
    for (const Ref<rt::Object>& each : tags_) registry_->removeScopesWithTag(each);
    return 0;
  }

  static constexpr std::size_t kThreads = 8;

  std::atomic<std::uint64_t> rounds_ = 0;

 private:
  void resolve(std::size_t first) {
    for (std::size_t i = 0; i < tags_.size(); ++i) {
      const SRLScopeTagSet tags = tagSet(tags_.at((first + i) % tags_.size()), tags_.at(i));
      registry_->internalService(&scopedAPI, tags);
      registry_->internalService(&nestedAPI, tags);
      SRLRegistry::sharedInstance()->internalOptionalService(&freshAPI, tags);
      registry_->internalOptionalService(&unknownAPI, tags);
    }
  }
  void removeScopes() {
    for (const Ref<rt::Object>& each : tags_) registry_->removeScopesWithTag(each);
    const Ref<SRLRegistry> copy = registry_->mutableCopy();
    copy->internalService(&globalAPI, {});
  }
  static void logMessages() {
    log(LUMLogLevelInfo);
    log(LUMLogLevelError);
    report();
  }
  void changeLoggers() {
    const auto filter = LUMLogNoFilter::init();
    LUMLogMultiplexer::sharedInstance()->addLogFilter(filter);
    LUMLogMultiplexer::sharedInstance()->removeLogFilter(filter);
    ZEBLogger::setSharedLogger(newLogger());
  }
  static void logLines() {
    const Ref<ZEBLogger> logger = ZEBLogger::sharedLogger();
    for (int i = 0; i < 5; ++i) logger->logError("line %d"_s, i);
  }
  static void setPieces() {
    const Ref<ZEBLogger> logger = ZEBLogger::sharedLogger();
    logger->setFilter(nullptr);
    logger->setFormatter(nullptr);
    logger->setFormatter(ZEBLogStandardFormatter::init());
  }
  void writeAndQueue() {
    file_->writeLine("line");
    queue_->async([this] { ++rounds_; });
    queue_->barrierSync();
    rt::make<rt::Queue>("Short"_s)->sync([] {});
  }

  const std::array<Ref<rt::Object>, 4> tags_{rt::make<Tag>(), rt::make<Tag>(), rt::make<Tag>(),
                                             rt::make<Tag>()};
  std::atomic<bool> isBusy_ = false;
  std::atomic<bool> isEnding_ = false;
  std::vector<std::thread> threads_;
};

// Whatever the other threads were doing at the fork, a child can use everything and ends.
TEST_F(BusyForks, ChildrenCanUseAllLibraries) {
  constexpr int kBursts = RT_TEST_THREAD_SANITIZER || RT_TEST_ADDRESS_SANITIZER ? 10 : 100;
  std::array<pid_t, 10> children{};
  for (int burst = 0; burst < kBursts; ++burst) {
    rt::MainQueue::drain();  // This destroys registries whose last reference went on another thread.
    beBusy(true);
    const std::uint64_t before = rounds_;
    while (rounds_ < before + kThreads) std::this_thread::yield();
    for (pid_t& each : children) {
      each = startChild([&] {
        const int status = useAll();
        return status != 0 ? status : useLoggersAndQueues();
      });
    }
    beBusy(false);
    for (const pid_t each : children) ASSERT_EQ(statusOf(each), 0) << "in burst " << burst;
  }
}

}  // namespace
