// Tests loggers and reports when allocations fail.

#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <atomic>
#include <filesystem>
#include <new>
#include <string>

#include "Foundation/ZEBLoggerMacroHelpers.h"
#include "Libraries/Util/ErrorHandler/PECErrorHandler.h"
#include "Libraries/Util/ErrorHandler/PECReport.h"
#include "Runtime/Objects/Exception.h"
#include "Runtime/Queues/Queue.h"
#include "Shared/Logging/LUMLog.h"
#include "Shared/Logging/LUMLogComponentFilter.h"
#include "Shared/Logging/LUMLogDropAllFilter.h"
#include "Shared/Logging/LUMLogLogicalOrFilter.h"
#include "Shared/Logging/LUMLogMinimumLevelFilter.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/LUMSystemLogger.h"
#include "Shared/Logging/Shim/Classes/LUMLoggingReroutingZEBLogger.h"
#include "tests/support/AllocationFailure.h"
#include "tests/support/PrivateDefaults.h"
#include "tests/support/TestLoggers.h"
#include "tests/support/WithoutMemory.h"

namespace {

using namespace rt::literals;
using rt::Ref;
using WithoutMemory::tryEachAllocation;

const PrivateDefaults privateDefaults;

constexpr const char* kLong =
    "a text that is too long to be kept in a string of the language's library itself";

std::atomic<int> seen = 0;
std::atomic<int> seenLater = 0;

// Receives messages asynchronously, and faults synchronously. After a barrier on its queue, all have arrived.
class LaterLogger final : public rt::Implements<LaterLogger, rt::Object, LUMAsyncLogger> {
 public:
  void logWithMessage(const Ref<LUMLogMessage>& /*message*/) override { ++seenLater; }
  Ref<LUMLogFilter> filter() const override { return nullptr; }
  Ref<rt::Queue> operationQueue() const override { return queue_; }
  LUMLogDispatchMode dispatchModeForMessage(const LUMLogMessage& message) const override {
    return message.level() == LUMLogLevelFault ? LUMLogDispatchModeSynchronous : 0;
  }

 private:
  const Ref<rt::Queue> queue_ = rt::make<rt::Queue>("LaterLogger"_s);
};

// Keeps the messages out of the system's log, which would get a line for each attempt.
void quietSystemLog() {
  static const Ref<LUMSystemLogger> quiet = LUMSystemLogger::initWithFilter(LUMLogDropAllFilter::init());
  LUMLogMultiplexer::sharedInstance()->addSyncLogger(quiet);
}

void waitForLoggers(const Ref<LaterLogger>& logger) {
  LUMLogMultiplexer::sharedInstance()->waitForLogging();
  logger->operationQueue()->barrierSync();
}

// A failed allocation on a logger's queue used to end the program.
TEST(WithoutMemory, LogsMessages) {
  tryEachAllocation([] {
    quietSystemLog();
    const Ref<LUMLogMultiplexer>& multiplexer = LUMLogMultiplexer::sharedInstance();
    const Ref<LaterLogger> later = rt::make<LaterLogger>();
    const Ref<TestSyncLogger> now = rt::make<TestSyncLogger>([](const Ref<LUMLogMessage>&) { ++seen; });
    const Ref<LUMLogFilter> filter = LUMLogMinimumLevelFilter::initWithMinimumLevel(LUMLogLevelInfo);
    struct End {
      ~End() {
        const AllocationFailure::Pause pause;
        multiplexer.removeAsyncLogger(later);
        multiplexer.removeSyncLogger(now);
        multiplexer.removeLogFilter(filter);
        waitForLoggers(later);
        multiplexer.setCaptureCallStackAddresses(true);
      }
      LUMLogMultiplexer& multiplexer;
      const Ref<LaterLogger>& later;
      const Ref<TestSyncLogger>& now;
      const Ref<LUMLogFilter>& filter;
    } const end{*multiplexer, later, now, filter};
    multiplexer->addAsyncLogger(later);
    multiplexer->addSyncLogger(now);
    multiplexer->addLogFilter(filter);
    seen = 0;
    seenLater = 0;
    const Ref<LUMLogMetadata> metadata = LUMLogMetadata::metadataWithComponent("Importer"_s);
    EXPECT_FALSE(LUMLogAt(LUMLogLevelDebug, "nobody sees it"_s));
    EXPECT_TRUE(LUMLogAt(LUMLogLevelInfo, metadata, "%@ and %d"_s,
                         LUMSafeStringParameter::parameterWithString("parameter"_s, 1), 7));
    EXPECT_TRUE(LUMLogAt(LUMLogLevelError, "with addresses"_s));
    EXPECT_TRUE(LUMLogAt(LUMLogLevelFault, "at once"_s));
    EXPECT_EQ(seen, 3);
    EXPECT_GE(seenLater, 1);
    multiplexer->setCaptureCallStackAddresses(false);
    EXPECT_TRUE(multiplexer->captureCallStack());
    waitForLoggers(later);
    EXPECT_LE(seenLater, 3);
  });
}

TEST(WithoutMemory, LogsToTheSystem) {
  // Keeps the lines for standard error off the terminal.
  const int nowhere = open("/dev/null", O_WRONLY | O_CLOEXEC);
  tryEachAllocation([&] {
    const int before = dup(STDERR_FILENO);
    dup2(nowhere, STDERR_FILENO);
    struct End {
      ~End() {
        dup2(before, STDERR_FILENO);
        close(before);
      }
      int before;
    } const end{before};
    const Ref<LUMSystemLogger> logger = LUMSystemLogger::initWithFilter(nullptr);
    logger->logWithMessage(messageWith(LUMLogLevelError, rt::String::fromUTF8(kLong)));
    logger->logWithMessage(messageWith(LUMLogLevelInfo, "short"_s));
  });
  close(nowhere);
}

// The first use of the shared logger used to throw. The shared logger never throws. Without memory it is
// null, and lines are lost.
TEST(WithoutMemory, LogsWithTheOlderLogger) {
  const std::string parent = std::filesystem::is_directory("/dev/shm") ? "/dev/shm/" : testing::TempDir();
  const std::string path = parent + "without-memory." + std::to_string(getpid());
  tryEachAllocation([&] {
    const Ref<ZEBLogger> shared = ZEBLogger::sharedLogger();
    rt::String text;
    {
      const AllocationFailure::Pause pause;
      text = rt::String::fromUTF8(path.c_str());
    }
    const Ref<ZEBLogger> logger = ZEBLogger::standardLoggerWithPath(text);
    if (logger) {
      logger->logInfo("%@ has %d entries"_s, "text"_s, 7);
      logger->logFuncError("function", "%s"_s, kLong);
      logger->logMessage(text, ZEBLogLevelInfo);
      logger->logMessage(text, ZEBLogLevelDebug);
    }
    ZEBLogger::setSharedLogger(logger);
    // NOLINTNEXTLINE(bugprone-lambda-function-name): the name does not matter here
    ZEBLogDebug("through the shared logger"_s);
    ZEBLogger::setSharedLogger(nullptr);
    // Each logger is null or complete.
    for (const Ref<ZEBLogger>& each : {ZEBLogger::standardLoggerWithStderr(), ZEBLogger::standardLogger(),
                                       ZEBLogger::standardLoggerWithStdoutAndStderr(), ZEBLogger::logger()}) {
      EXPECT_TRUE(!each || (each->writer() && each->formatter() && each->filter()));
    }
  });
  unlink(path.c_str());
}

TEST(WithoutMemory, ReroutesTheOlderLogger) {
  tryEachAllocation([] {
    quietSystemLog();
    const Ref<ZEBLogger> logger =
        LUMLoggingReroutingZEBLogger::initWithLogMultiplexer(LUMLogMultiplexer::sharedInstance());
    logger->logInfo("%@ has %d entries"_s, "text"_s, 7);
    logger->logFuncAssert("function", "%s"_s, kLong);
    logger->logMessage("message"_s, ZEBLogLevelError);
  });
}

TEST(WithoutMemory, ReportsErrors) {
  tryEachAllocation([] {
    quietSystemLog();
    const Ref<PECErrorHandler>& handler = PECErrorHandler::sharedInstance();
    handler->setErrorCount(0);
    seen = 0;
    handler->setErrorHandlerBlock([](const Ref<PECErrorDescription>& error) {
      EXPECT_TRUE(error->errorMessage());
      ++seen;
    });
    const auto report = [](const char* text) {
      PECReport({"Shared/File", "-[Class operation]"}, "%@ is %@"_s, rt::String::fromUTF8(text), 7);
    };
    report("a parameter");
    EXPECT_EQ(seen, 1);
    EXPECT_EQ(handler->errorCount(), 1);
    EXPECT_EQ(PECErrorHandler::errorCountInBlock([&] { report(kLong); }), 1);
    EXPECT_EQ(seen, 1);
  });
}

}  // namespace
