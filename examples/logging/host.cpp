// A host program that logs. One logger writes the messages of one component to a file, on its own queue; the
// file is standard output here. An error callback receives every misuse of the libraries.
//
// The entries are also in the system's log: journalctl SUBSYSTEM=com.example.Importer

#include <utility>

#include "Libraries/Util/ErrorHandler/PECErrorHandler.h"
#include "Runtime/Process/FileHandle.h"
#include "Runtime/Queues/Queue.h"
#include "Runtime/Text/Format.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMAsyncLogger.h"
#include "Shared/Logging/LUMLog.h"
#include "Shared/Logging/LUMLogComponentFilter.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/LUMSafeNumberParameter.h"

using namespace rt::literals;

extern "C" const char kMainBundleIdentifier[] = "com.example";

class FileLogger final : public rt::Implements<FileLogger, rt::Object, LUMAsyncLogger> {
 public:
  FileLogger(rt::Ref<rt::FileHandle> file, rt::Ref<LUMLogFilter> filter)
      : file_(std::move(file)), filter_(std::move(filter)) {}

  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override {
    file_->writeLine(rt::format("%lu: %@"_s, message->level(), message->formattedString()));
  }
  rt::Ref<LUMLogFilter> filter() const override { return filter_; }
  rt::Ref<rt::Queue> operationQueue() const override { return queue_; }

  // A fault is written before the program goes on.
  LUMLogDispatchMode dispatchModeForMessage(const LUMLogMessage& message) const override {
    return message.level() == LUMLogLevelFault ? LUMLogDispatchModeSynchronous : 0;
  }

 private:
  const rt::Ref<rt::FileHandle> file_;
  const rt::Ref<LUMLogFilter> filter_;
  const rt::Ref<rt::Queue> queue_ = rt::make<rt::Queue>("FileLogger"_s, rt::QualityOfService::kUtility);
};

int main() {
  const rt::Ref<LUMLogMultiplexer>& multiplexer = LUMLogMultiplexer::sharedInstance();
  const rt::Ref<FileLogger> logger = rt::make<FileLogger>(
      rt::FileHandle::standardOutput(), LUMLogComponentFilter::initWithComponent("Importer"_s));
  multiplexer->addAsyncLogger(logger);

  PECErrorHandler::sharedInstance()->registerErrorHandlerBlock([](const rt::Ref<PECErrorDescription>& error) {
    rt::FileHandle::standardOutput()->writeLine(
        rt::format("line %lu: %@"_s, error->lineNumber(), error->errorMessage()));
  });

  const rt::Ref<LUMLogMetadata> importer = LUMLogMetadata::metadataWithComponent("Importer"_s);
  const rt::String name = "holiday.tar"_s;
  LUMLogAt(LUMLogLevelInfo, importer, "%@ has %d entries"_s, name, 3);
  LUMLogAt(LUMLogLevelInfo, "of no component"_s);

  // The message also keeps a safe parameter by itself, so that it can be uploaded.
  const rt::Ref<LUMLogMessage> message =
      LUMLogAt(LUMLogLevelError, importer->metadataByAddingCategory("archive"_s), "entry %@ is damaged"_s,
               LUMSafeNumberParameter::parameterWithNumber(rt::Number::of(2), 1));

  // The messages are in the file after both queues have run.
  multiplexer->waitForLogging();
  logger->operationQueue()->barrierSync();
  rt::FileHandle::standardOutput()->writeLine(
      rt::format("%zu safe parameter"_s, message->safeParameters()->count()));

  // Setting a second callback is a mistake, which the first callback receives.
  PECErrorHandler::sharedInstance()->registerErrorHandlerBlock([](const rt::Ref<PECErrorDescription>&) {});
  return 0;
}
