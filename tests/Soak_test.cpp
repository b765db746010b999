// Uses everything at once for a chosen time: `Soak_test --seconds=N`.
//
// Eight threads resolve services, log, remove scopes and change user defaults. Meanwhile the process forks
// and starts programs, the journal restarts, and the clock jumps. This happens in rounds. After each round:
//
// - every message to a logger has arrived once, in its thread's order
// - every entry for the journal has arrived once, or is counted as dropped
// - every service of a removed scope has been destroyed
// - since the first rounds, the number of descriptors has not changed
// - since the first rounds, the process has gained at most 128 KiB of memory
// - since the first rounds, the process has gained at most 8 threads, which belong to the queues' pool

#include <gtest/gtest.h>
#include <malloc.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <exception>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <optional>
#include <random>
#include <set>
#include <sstream>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

#include "Foundation/ZEBFileHandleLogWriter.h"
#include "Foundation/ZEBLogBasicFormatter.h"
#include "Foundation/ZEBLogNoFilter.h"
#include "Foundation/ZEBLogger.h"
#include "Libraries/Util/ErrorHandler/PECErrorHandler.h"
#include "Runtime/Defaults/UserDefaults.h"
#include "Runtime/SystemLog/SystemLog.h"
#include "Shared/Logging/LUMLog.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/ServiceRegistry/ServiceRegistry.h"
#include "tests/support/ClockHook.h"
#include "tests/support/ForkTest.h"
#include "tests/support/PrivateJournal.h"
#include "tests/support/Process.h"
#include "tests/support/Sanitizers.h"
#include "tests/support/SettingsFile.h"
#include "tests/support/TestBindings.h"
#include "tests/support/TestLoggers.h"

// NOLINTNEXTLINE(bugprone-reserved-identifier): the sanitizers define it
extern "C" std::size_t __sanitizer_get_current_allocated_bytes();

namespace {

using namespace rt::literals;
using rt::Ref;

constexpr std::size_t kWorkers = 8;
constexpr std::chrono::seconds kRound(2);
// The folder is in a tmpfs, so that no test waits for a disk.
constexpr const char* kFolder = "/run/soak";

std::chrono::seconds duration(SOAK_SECONDS);
std::string refusal;

/// Numbers the messages of each worker that go one way, and checks that they arrive.
class Ledger {
 public:
  std::uint64_t next(std::size_t worker) { return given_[worker]++; }

  /// Notes that the message `number` of `worker` has arrived.
  void take(std::size_t worker, std::uint64_t number) {
    if (taken_[worker].fetch_add(1) != number) isInOrder_ = false;
  }

  void expectComplete(const char* way) const {
    EXPECT_TRUE(isInOrder_) << way;
    for (std::size_t worker = 0; worker < kWorkers; ++worker)
      EXPECT_EQ(taken_[worker], given_[worker]) << way;
  }

  std::uint64_t sum() const {
    std::uint64_t sum = 0;
    for (const auto& each : given_) sum += each;
    return sum;
  }

 private:
  std::array<std::atomic<std::uint64_t>, kWorkers> given_{};
  std::array<std::atomic<std::uint64_t>, kWorkers> taken_{};
  std::atomic<bool> isInOrder_ = true;
};

// Notes in `ledger` that the message has arrived. Its text is the worker and the number.
void takeInto(Ledger& ledger, const LUMLogMessage& message) {
  std::istringstream words(text(message));
  std::size_t worker = 0;
  std::uint64_t number = 0;
  if (!(words >> worker >> number) || worker >= kWorkers) return;
  ledger.take(worker, number);
}

Ref<LUMLogFilter> onlyLevel(LUMLogLevel level) {
  return rt::make<TestFilter>([level](const LUMLogMessage& message) { return message.level() == level; });
}

/// A service that stores its tag. The living services are counted.
class Part final : public rt::Implements<Part, rt::Object> {
 public:
  explicit Part(const SRLScopeTagSet& tags) : tag(tags.tags[0]) { ++living; }
  ~Part() override { --living; }

  static constinit std::atomic<std::int64_t> living;
  const void* const tag;
};
constinit std::atomic<std::int64_t> Part::living = 0;

Ref<rt::Object> makePart(SRLScopeTagSet tags) {
  return rt::make<Part>(tags);
}

constexpr SRLAPIInstanceType kPartType{.names = {.protocolName = nullptr, .className = "Part"}};
constexpr SRLAPIRegistrationData kScopedAPI{
    .identifier = "Scoped", .instanceType = kPartType, .scopeType = 0b1, .identifierLength = 6};
constexpr SRLAPIRegistrationData kOuterAPI{
    .identifier = "Outer", .instanceType = kPartType, .scopeType = 0b1, .identifierLength = 5};
constexpr SRLAPIRegistrationData kFreshAPI{
    .identifier = "Fresh", .instanceType = kPartType, .scopeType = 0b1, .identifierLength = 5};
constexpr SRLAPIRegistrationData kManyAPI{.identifier = "Many",
                                          .instanceType = kPartType,
                                          .scopeType = 0b1,
                                          .identifierLength = 4,
                                          .isMultibound = 1};
constexpr SRLAPIRegistrationData kNullAPI{
    .identifier = "Null", .instanceType = kPartType, .scopeType = 0b1, .identifierLength = 4};

Ref<rt::Object> makeOuter(SRLScopeTagSet tags) {
  SRLRegistry::sharedInstance()->internalService(&kScopedAPI, tags);
  return makePart(tags);
}
Ref<rt::Object> makeNothing(SRLScopeTagSet /*tags*/) {
  return nullptr;
}

using Record = SRLImplementationRegistrationData;
constexpr SRLImplementationRegistrationData kScoped{
    .identifier = "ScopedPart", .instanceType = {.className = "Part"}, .factory = makePart, .scopeType = 0b1};
constexpr SRLImplementationRegistrationData kOuter{
    .identifier = "OuterPart", .instanceType = {.className = "Part"}, .factory = makeOuter, .scopeType = 0b1};
constexpr SRLImplementationRegistrationData kFresh{.identifier = "FreshPart",
                                                   .instanceType = {.className = "Part"},
                                                   .factory = makePart,
                                                   .scopeType = 0b1,
                                                   .lifetime = 1};
constexpr SRLImplementationRegistrationData kNothing{.identifier = "NoPart",
                                                     .instanceType = {.className = "Part"},
                                                     .factory = makeNothing,
                                                     .scopeType = 0b1,
                                                     .lifetime = 1};
constexpr const Record* kScopedBinding[] = {&kScoped, nullptr};
constexpr const Record* kOuterBinding[] = {&kOuter, nullptr};
constexpr const Record* kFreshBinding[] = {&kFresh, nullptr};
constexpr const Record* kManyBinding[] = {&kScoped, &kFresh, nullptr};
constexpr const Record* kNullBinding[] = {&kNothing, nullptr};

/// What is counted during a round.
struct Round {
  Ledger synchronous;
  Ledger asynchronous;
  Ledger blocking;
  Ledger journal;
  Ledger lines;
  std::atomic<std::int32_t> reports = 0;
  std::atomic<std::int32_t> expectedReports = 0;
  const std::uint64_t droppedBefore = rt::SystemLog::droppedCount();
};

/// Sets up what all workers share.
struct World {
  World() {
    SRLRegistry::setSharedInstance(registryWith({&module}));
    PECErrorHandler::register_();
    PECErrorHandler::sharedInstance()->setErrorHandlerBlock(
        [this](const Ref<PECErrorDescription>&) { ++round->reports; });
    const Ref<LUMLogMultiplexer>& multiplexer = LUMLogMultiplexer::sharedInstance();
    multiplexer->addSyncLogger(syncLogger);
    const auto later = rt::make<TestAsyncLogger>(
        rt::make<rt::Queue>("later"_s),
        [this](const Ref<LUMLogMessage>& message) { takeInto(round->asynchronous, *message); });
    later->filter_ = onlyLevel(LUMLogLevelDebug);
    multiplexer->addAsyncLogger(later);
    const auto atOnce = rt::make<TestAsyncLogger>(
        rt::make<rt::Queue>("at once"_s),
        [this](const Ref<LUMLogMessage>& message) { takeInto(round->blocking, *message); });
    atOnce->filter_ = onlyLevel(LUMLogLevelInfo);
    atOnce->dispatchMode_ = [](const LUMLogMessage&) { return LUMLogDispatchModeSynchronous; };
    multiplexer->addAsyncLogger(atOnce);
    asyncLoggers = {later, atOnce};
    for (std::size_t i = 0; i < tags.size(); ++i)
      tags[i] = rt::String::fromUTF8("tag " + std::to_string(i)).object();
  }

  World(const World&) = delete;
  World& operator=(const World&) = delete;
  ~World() {
    const Ref<LUMLogMultiplexer>& multiplexer = LUMLogMultiplexer::sharedInstance();
    multiplexer->removeSyncLogger(syncLogger);
    for (const auto& logger : asyncLoggers) multiplexer->removeAsyncLogger(logger);
    PECErrorHandler::resetAfterTest();
    SRLRegistry::setSharedInstance(nullptr);
  }

  /// Waits until all logged messages have arrived.
  void settle() const {
    LUMLogMultiplexer::sharedInstance()->waitForLogging();
    for (const auto& logger : asyncLoggers) logger->operationQueue()->sync([] {});
  }

  const TestModule module{{{&kScopedAPI, kScopedBinding},
                           {&kOuterAPI, kOuterBinding},
                           {&kFreshAPI, kFreshBinding},
                           {&kManyAPI, kManyBinding},
                           {&kNullAPI, kNullBinding}}};
  std::array<Ref<rt::Object>, 16> tags;
  const Ref<TestSyncLogger> syncLogger = rt::make<TestSyncLogger>(
      [this](const Ref<LUMLogMessage>& message) { takeInto(round->synchronous, *message); }, onlyLevel(0));
  std::vector<Ref<TestAsyncLogger>> asyncLoggers;
  const std::string linesPath = std::string(kFolder) + "/lines";
  const Ref<ZEBLogger> olderLogger = ZEBLogger::loggerWithWriter(
      ZEBFileHandleLogWriter::fileHandleForLoggingAtPath(rt::String::fromUTF8(linesPath), 0600),
      rt::make<ZEBLogBasicFormatter>(), rt::make<ZEBLogNoFilter>());
  const Ref<rt::UserDefaults> defaults =
      rt::UserDefaults::initWithPath(rt::String::fromUTF8(std::string(kFolder) + "/defaults.conf"));
  SettingsFile settings{std::string(kFolder) + "/defaults.conf"};

  std::unique_ptr<Round> round = std::make_unique<Round>();
  const rt::String component = "soak"_s;
  const Ref<LUMLogMetadata> metadata = LUMLogMetadata::metadataWithComponent(component);
};

/// Performs random steps. The same seed yields the same steps.
class Worker {
 public:
  Worker(World& world, std::size_t number, unsigned seed) : world_(world), number_(number), random_(seed) {}

  void step() {
    const Ref<rt::Object>& tag = world_.tags[random_() % world_.tags.size()];
    const SRLScopeTagSet tags{{tag.get()}};
    const Ref<SRLRegistry> registry = SRLRegistry::sharedInstance();
    switch (random_() % 64) {
      case 0:
        registry->removeScopesWithTag(tag);
        break;
      case 1:
        log(world_.round->journal, LUMLogLevelError, world_.metadata);
        break;
      case 2:
        setting_ = std::to_string(random_());
        world_.settings.set(key(), setting_);
        break;
      case 3:
        expectSettingKept();
        break;
      case 4:
        world_.olderLogger->logError("%zu %lu"_s, number_, world_.round->lines.next(number_));
        break;
      case 5:
        world_.olderLogger->setFormatter(rt::make<ZEBLogBasicFormatter>());
        break;
      case 6:
        ++world_.round->expectedReports;
        EXPECT_FALSE(registry->internalService(&kNullAPI, tags));
        break;
      case 7:
      case 8:
        log(world_.round->blocking, LUMLogLevelInfo);
        break;
      case 9:
      case 10:
      case 11:
      case 12:
        log(world_.round->asynchronous, LUMLogLevelDebug);
        break;
      case 13:
      case 14:
      case 15:
      case 16:
        log(world_.round->synchronous, 0);
        break;
      case 17:
      case 18:
        EXPECT_EQ(registry->internalMultiBoundService(&kManyAPI, tags)->count(), 2U);
        break;
      case 19:
      case 20:
      case 21:
        expectPart(registry->internalOptionalService(&kFreshAPI, tags), tag);
        break;
      case 22:
      case 23:
      case 24:
        expectPart(registry->internalService(&kOuterAPI, tags), tag);
        break;
      default:
        expectPart(registry->internalService(&kScopedAPI, tags), tag);
    }
  }

  /// Expects to read the value that this worker has set last.
  void expectSettingKept() const { EXPECT_EQ(readSetting(), setting_); }

 private:
  std::string key() const { return "worker" + std::to_string(number_); }
  std::string readSetting() const { return std::string(world_.defaults->stringForKey(key()).view()); }

  void log(Ledger& ledger, LUMLogLevel level, const Ref<LUMLogMetadata>& metadata = nullptr) {
    LUMLogAt(level, metadata, "%zu %lu"_s, number_, ledger.next(number_));
  }

  static void expectPart(const Ref<rt::Object>& service, const Ref<rt::Object>& tag) {
    const Part* const part = rt::cast<Part>(service.get());
    ASSERT_NE(part, nullptr);
    EXPECT_EQ(part->tag, tag.get());
  }

  World& world_;
  const std::size_t number_;
  std::mt19937 random_;
  std::string setting_ = readSetting();
};

/// The resources of the process that must not grow.
struct Holdings {
  static Holdings now() {
    const auto entries = [](const char* folder) {
      return std::distance(std::filesystem::directory_iterator(folder),
                           std::filesystem::directory_iterator());
    };
    return {allocatedBytes(), entries("/proc/self/task"), entries("/proc/self/fd")};
  }

  static std::size_t allocatedBytes() {
#if RT_TEST_ADDRESS_SANITIZER || RT_TEST_THREAD_SANITIZER
    return __sanitizer_get_current_allocated_bytes();
#else
    const struct mallinfo2 heap = mallinfo2();
    return heap.uordblks + heap.hblkhd;
#endif
  }

  std::size_t bytes;
  std::ptrdiff_t threads;
  std::ptrdiff_t descriptors;
};

// Uses the libraries in a child that was forked while other threads were busy. Returns 0 if everything
// worked.
int workInChild(World& world) {
  Worker worker(world, 0, 1);
  const SRLScopeTagSet tags{{world.tags[0].get()}};
  const Ref<SRLRegistry> registry = SRLRegistry::sharedInstance();
  if (!registry->internalService(&kOuterAPI, tags)) return 1;
  registry->removeScopesWithTag(world.tags[0]);
  if (!registry->internalService(&kScopedAPI, tags)) return 2;
  LUMLogAt(0, "in a child"_s);
  LUMLogAt(LUMLogLevelInfo, "in a child"_s);
  ZEBLogger::sharedLogger();
  if (!world.defaults->stringForKey("none").isNull()) return 3;
  return 0;
}

// Returns how many descriptors the process has, without the standard streams.
int countDescriptors() {
  int count = 0;
  for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fd")) {
    if (std::stoi(entry.path().filename()) > STDERR_FILENO) ++count;
  }
  return count - 1;  // The iterator has the folder itself open.
}

// The number of descriptors that the process inherited.
int inheritedDescriptors = 0;

// Returns how many of its own descriptors the process passes on to programs that it starts.
int descriptorsHandedOn() {
  const ProcessResult result = runProcess({"/proc/self/exe", "--descriptors"});
  return result.exitStatus.value_or(-1) - inheritedDescriptors;
}

class Soak : public testing::Test {
 protected:
  void SetUp() override {
    if (!PrivateJournal::entered()) GTEST_SKIP() << refusal;
  }
};

void disturb(World& world, PrivateJournal& journal) {
  static constinit std::atomic<std::int64_t> secondsAhead = 0;
  clockHook = [](clockid_t clock, timespec& time) {
    if (clock == CLOCK_REALTIME) time.tv_sec += secondsAhead.load();
  };
  std::mt19937 random(7);
  const auto end = std::chrono::steady_clock::now() + kRound;
  while (std::chrono::steady_clock::now() < end) {
    secondsAhead = static_cast<std::int64_t>(random() % 200'000) - 100'000;
    // The thread sanitizer's own locks do not support a child that does more than start a program.
    if (!RT_TEST_THREAD_SANITIZER) {
      EXPECT_EQ(statusOfChild([&] { return workInChild(world); }), 0);
    }
    EXPECT_EQ(descriptorsHandedOn(), 0);
    journal.stop();
    journal.start();
  }
  clockHook = nullptr;
}

void expectAccountedFor(World& world, const PrivateJournal& journal, const std::vector<Worker>& workers) {
  Round& round = *world.round;
  round.synchronous.expectComplete("synchronous");
  round.asynchronous.expectComplete("asynchronous");
  round.blocking.expectComplete("blocking");
  EXPECT_EQ(round.reports, round.expectedReports);

  // The journal must contain each message of the workers once, and the reports.
  std::set<std::string> texts;
  std::uint64_t entries = 0;
  for (PrivateJournal::Entry& entry : journal.entries("SYSLOG_IDENTIFIER=Soak_test")) {
    if (entry["SUBSYSTEM"] == "rt") continue;
    ++entries;
    if (entry["SUBSYSTEM"] == world.component.view()) {
      EXPECT_TRUE(texts.insert(entry["MESSAGE"]).second) << entry["MESSAGE"] << " has come twice";
    }
  }
  const std::uint64_t dropped = rt::SystemLog::droppedCount() - round.droppedBefore;
  EXPECT_EQ(entries + dropped, round.journal.sum() + static_cast<std::uint64_t>(round.reports.load()));

  std::ifstream lines(world.linesPath);
  std::size_t worker = 0;
  std::uint64_t number = 0;
  while (lines >> worker >> number && worker < kWorkers) round.lines.take(worker, number);
  round.lines.expectComplete("older logger");
  std::filesystem::resize_file(world.linesPath, 0);

  for (const Ref<rt::Object>& tag : world.tags) SRLRegistry::sharedInstance()->removeScopesWithTag(tag);
  EXPECT_EQ(Part::living, 0);
  for (const Worker& each : workers) each.expectSettingKept();
}

TEST_F(Soak, LosesNoMessagesAndLeaksNoResources) {
  World world;
  std::atomic<int> changes = 0;
  const rt::UserDefaults::Observation observation =
      world.defaults->observe("worker0", rt::UserDefaults::Notify::kOnChange, [&] { ++changes; });
  // Tables and pools reach their final size in the first rounds.
  constexpr int kFirstRounds = 2;
  constexpr std::size_t kToleratedBytes = std::size_t{128} * 1024;
  constexpr std::ptrdiff_t kToleratedThreads = 8;
  std::optional<Holdings> first;
  std::uint64_t messages = 0;
  const auto end = std::chrono::steady_clock::now() + duration;
  for (int round = 0; std::chrono::steady_clock::now() < end || round <= kFirstRounds; ++round) {
    PrivateJournal journal(PrivateJournal::Sockets::ownedByManager);
    journal.start();
    world.round = std::make_unique<Round>();
    std::vector<Worker> workers;
    workers.reserve(kWorkers);
    for (std::size_t i = 0; i < kWorkers; ++i)
      workers.emplace_back(world, i, static_cast<unsigned>(round * 100) + static_cast<unsigned>(i));
    {
      std::atomic<bool> isOver = false;
      std::vector<std::jthread> threads;
      for (Worker& each : workers) {
        threads.emplace_back([&] {
          while (!isOver) each.step();
        });
      }
      disturb(world, journal);
      isOver = true;
    }
    world.settle();
    expectAccountedFor(world, journal, workers);
    const Round& counts = *world.round;
    for (const Ledger* ledger :
         {&counts.synchronous, &counts.asynchronous, &counts.blocking, &counts.journal, &counts.lines}) {
      messages += ledger->sum();
    }
    const Holdings holdings = Holdings::now();
    std::printf("round %d: %lu messages so far, %lu dropped; %zu bytes, %td threads, %td descriptors\n",
                round, messages, rt::SystemLog::droppedCount(), holdings.bytes, holdings.threads,
                holdings.descriptors);
    if (!first && round == kFirstRounds) first = holdings;
    if (first) {
      EXPECT_LE(holdings.bytes, first->bytes + kToleratedBytes);
      EXPECT_LE(holdings.threads, first->threads + kToleratedThreads);
      EXPECT_EQ(holdings.descriptors, first->descriptors);
    }
    if (HasFailure()) break;
  }
  EXPECT_GT(changes, 0);
}

}  // namespace

int main(int argumentCount, char** arguments) {
  testing::InitGoogleTest(&argumentCount, arguments);
  inheritedDescriptors = countDescriptors();
  if (argumentCount > 1) {
    const std::string_view option = arguments[1];
    if (option == "--descriptors") return countDescriptors();
    constexpr std::string_view kSeconds = "--seconds=";
    if (!option.starts_with(kSeconds)) {
      std::fprintf(stderr, "usage: Soak_test [--seconds=N]\n");
      return 2;
    }
    duration = std::chrono::seconds(std::stol(std::string(option.substr(kSeconds.size()))));
  }
  if (!testing::GTEST_FLAG(list_tests)) {
    try {
      PrivateJournal::enter();
      std::filesystem::create_directory(kFolder);
    } catch (const std::exception& problem) {
      refusal = std::string("no private journal: ") + problem.what();
    }
  }
  return RUN_ALL_TESTS();
}
