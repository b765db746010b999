// Filters and loggers are one immutable object, which is replaced as a whole. A message takes a reference to
// it without a lock. A change makes the next object without a lock, and makes it again if another thread was
// quicker. So the `isEqual` of members, which is a host's code, never runs under a lock.
//
// If there are no asynchronous loggers, or all of them want the message at once, nothing is queued.

#include "Shared/Logging/LUMLogMultiplexer.h"

#include <algorithm>
#include <new>
#include <string_view>
#include <utility>
#include <vector>

#include "Runtime/Locks/Private/Lazy.h"
#include "Runtime/Queues/QualityOfService.h"
#include "Runtime/Queues/Queue.h"
#include "Shared/Logging/LUMDefaultMinimumLogLevelFilter.h"
#include "Shared/Logging/LUMLogInterest.h"
#include "Shared/Logging/Private/LUMLogWanted.h"

namespace {

using namespace rt::literals;

template <class T>
void add(std::vector<rt::Ref<T>>& list, const rt::Ref<T>& object) {
  const bool isThere =
      std::ranges::any_of(list, [&](const rt::Ref<T>& other) { return rt::isEqual(other, object); });
  if (!isThere) list.push_back(object);
}

template <class T>
void remove(std::vector<rt::Ref<T>>& list, const rt::Object* object) {
  std::erase_if(list, [&](const rt::Ref<T>& other) { return rt::isEqual(other->asObject(), object); });
}

bool admits(const LUMLogger& logger, const LUMLogMessage& message) {
  const rt::Ref<LUMLogFilter> filter = logger.filter();
  return !filter || filter->allowLogMessage(message);
}

void deliver(LUMLogger& logger, const rt::Ref<LUMLogMessage>& message) {
  if (admits(logger, *message)) logger.logWithMessage(message);
}

// Queues `message` for those of `loggers` that do not want it at once, and returns those that do. A function
// of its own, so that a message costs nothing extra if there are no asynchronous loggers.
[[gnu::noinline]] std::vector<rt::Ref<LUMAsyncLogger>> deliverLater(
    const std::vector<rt::Ref<LUMAsyncLogger>>& loggers, const rt::Ref<LUMLogMessage>& message,
    rt::Queue& loggingQueue) {
  std::vector<rt::Ref<LUMAsyncLogger>> laterLoggers;
  std::vector<rt::Ref<LUMAsyncLogger>> blockingLoggers;
  for (const rt::Ref<LUMAsyncLogger>& logger : loggers) {
    const bool isBlocking = admits(*logger, *message) &&
                            logger->dispatchModeForMessage(*message) == LUMLogDispatchModeSynchronous;
    std::vector<rt::Ref<LUMAsyncLogger>>& list = isBlocking ? blockingLoggers : laterLoggers;
    list.reserve(loggers.size());
    list.push_back(logger);
  }
  if (laterLoggers.empty()) return blockingLoggers;
  loggingQueue.async([loggers = std::move(laterLoggers), message] {
    for (const rt::Ref<LUMAsyncLogger>& logger : loggers) {
      if (const rt::Ref<rt::Queue> queue = logger->operationQueue()) {
        try {
          queue->async([logger, message] { deliver(*logger, message); });
        } catch (const std::bad_alloc&) {  // NOLINT(bugprone-empty-catch): there is no caller to tell
        }
      }
    }
  });
  return blockingLoggers;
}

}  // namespace

struct LUMLogMultiplexer::Lists {
  std::vector<rt::Ref<LUMLogFilter>> filters;
  std::vector<rt::Ref<LUMSyncLogger>> syncLoggers;
  std::vector<rt::Ref<LUMAsyncLogger>> asyncLoggers;
  // The system logger that the multiplexer was made with. Null after another has replaced it.
  rt::Ref<LUMSystemLogger> systemLogger;
};

// A snapshot of the filters and loggers. One object, because each message retains it.
class LUMLogMultiplexer::Members final : public rt::Implements<Members, rt::Object> {
 public:
  static constexpr std::string_view kClassName = "LUMLogMultiplexerMembers";

  explicit Members(Lists given) : lists(std::move(given)) {}

  const Lists lists;
};

const rt::Ref<LUMLogMultiplexer>& LUMLogMultiplexer::sharedInstance() {
  static constinit rt::Lazy<rt::Ref<LUMLogMultiplexer>> instance;
  return instance.get([] {
    rt::Ref<LUMLogMultiplexer> shared = init();
    LUMLogWanted::attach(*shared);
    return shared;
  });
}

rt::Ref<LUMLogMultiplexer> LUMLogMultiplexer::init() {
  return initWithSystemLogger(LUMSystemLogger::initWithFilter(LUMDefaultMinimumLogLevelFilter::init()));
}

rt::Ref<LUMLogMultiplexer> LUMLogMultiplexer::initWithSystemLogger(rt::Ref<LUMSystemLogger> systemLogger) {
  return rt::Ref<LUMLogMultiplexer>::adopt(new LUMLogMultiplexer(std::move(systemLogger)));
}

LUMLogMultiplexer::LUMLogMultiplexer(rt::Ref<LUMSystemLogger> systemLogger)
    : loggingQueue_(rt::make<rt::Queue>("LUMLogMultiplexer"_s, rt::QualityOfService::kUtility)) {
  Lists lists;
  if (systemLogger) lists.syncLoggers.emplace_back(systemLogger);
  lists.systemLogger = std::move(systemLogger);
  members_.exchange(rt::make<Members>(std::move(lists)));
}

LUMLogMultiplexer::~LUMLogMultiplexer() = default;

[[gnu::flatten]] void LUMLogMultiplexer::logWithMessage(const rt::Ref<LUMLogMessage>& message) {
  if (!message) return;
  const rt::Ref<Members> current = members_.load();
  const Lists& lists = current->lists;

  for (const rt::Ref<LUMLogFilter>& filter : lists.filters) {
    if (!filter->allowLogMessage(*message)) return;
  }

  std::vector<rt::Ref<LUMAsyncLogger>> blockingLoggers;
  if (!lists.asyncLoggers.empty())
    blockingLoggers = deliverLater(lists.asyncLoggers, message, *loggingQueue_);

  for (const rt::Ref<LUMSyncLogger>& logger : lists.syncLoggers) deliver(*logger, message);

  for (const rt::Ref<LUMAsyncLogger>& logger : blockingLoggers) {
    if (const rt::Ref<rt::Queue> queue = logger->operationQueue()) {
      queue->sync([&] { deliver(*logger, message); });
    }
  }
}

LUMLogLevel LUMLogMultiplexer::lowestLevel(const rt::String* component) const noexcept {
  const rt::Ref<Members> current = members_.load();
  const Lists& lists = current->lists;
  LUMLogLevel ofLoggers = LUMLogLevelNone;
  const auto ask = [&](const auto& loggers) {
    for (const auto& logger : loggers) {
      const auto* interest = rt::cast<LUMLogInterest>(logger.get());
      ofLoggers = std::min(ofLoggers, interest != nullptr ? interest->lowestLevel(component) : 0);
    }
  };
  ask(lists.syncLoggers);
  ask(lists.asyncLoggers);
  LUMLogLevel ofFilters = 0;
  for (const rt::Ref<LUMLogFilter>& filter : lists.filters)
    ofFilters = std::max(ofFilters, LUMLogLowestLevel(filter.get(), component));
  return std::max(ofFilters, ofLoggers);
}

// Replaces the members by what `change` makes of a copy. Starts again if another thread was faster.
template <class Change>
void LUMLogMultiplexer::replaceMembers(Change change) {
  for (;;) {
    const rt::Ref<Members> known = members_.load();
    Lists lists = known->lists;
    change(lists);
    if (members_.compareExchange(known, rt::make<Members>(std::move(lists)))) break;
  }
  LUMLogWanted::refresh();
}

void LUMLogMultiplexer::addLogFilter(const rt::Ref<LUMLogFilter>& filter) {
  if (!filter) return;
  replaceMembers([&](Lists& lists) { add(lists.filters, filter); });
}

void LUMLogMultiplexer::removeLogFilter(const rt::Ref<LUMLogFilter>& filter) {
  if (!filter) return;
  replaceMembers([&](Lists& lists) { remove(lists.filters, filter->asObject()); });
}

void LUMLogMultiplexer::addSyncLogger(const rt::Ref<LUMSyncLogger>& logger) {
  if (!logger) return;
  const bool isSystemLogger = rt::cast<LUMSystemLogger>(logger.get()) != nullptr;
  replaceMembers([&](Lists& lists) {
    if (isSystemLogger && lists.systemLogger) {
      remove(lists.syncLoggers, lists.systemLogger.get());
      lists.systemLogger = nullptr;
    }
    add(lists.syncLoggers, logger);
  });
}

void LUMLogMultiplexer::removeSyncLogger(const rt::Ref<LUMSyncLogger>& logger) {
  if (!logger) return;
  replaceMembers([&](Lists& lists) { remove(lists.syncLoggers, logger->asObject()); });
}

void LUMLogMultiplexer::addAsyncLogger(const rt::Ref<LUMAsyncLogger>& logger) {
  if (!logger) return;
  replaceMembers([&](Lists& lists) { add(lists.asyncLoggers, logger); });
}

void LUMLogMultiplexer::removeAsyncLogger(const rt::Ref<LUMAsyncLogger>& logger) {
  if (!logger) return;
  replaceMembers([&](Lists& lists) { remove(lists.asyncLoggers, logger->asObject()); });
}

void LUMLogMultiplexer::waitForLogging() {
  loggingQueue_->barrierSync();
}

void LUMLogMultiplexer::setCaptureCallStack(bool capture) {
  captureCallStack_.store(capture, std::memory_order_relaxed);
}

void LUMLogMultiplexer::setCaptureCallStackAddresses(bool capture) {
  captureCallStackAddresses_.store(capture, std::memory_order_relaxed);
}

bool LUMLogMultiplexer::captureSwiftCallStackOnErrorAndAbove() const {
  return captureSwiftCallStackOnErrorAndAbove_.load(std::memory_order_relaxed);
}

void LUMLogMultiplexer::setCaptureSwiftCallStackOnErrorAndAbove(bool capture) {
  captureSwiftCallStackOnErrorAndAbove_.store(capture, std::memory_order_relaxed);
}
