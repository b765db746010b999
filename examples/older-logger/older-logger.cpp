// Code that logs through the shared logger, one line per call. The host chooses once, in `main`, which lines
// are written, where and in which form. With the argument "rerouted" it sends them to structured logging.

#include <string_view>

#include "Foundation/ZEBArrayCompositeLogWriter.h"
#include "Foundation/ZEBLogger.h"
#include "Foundation/ZEBLoggerMacroHelpers.h"
#include "Runtime/Process/FileHandle.h"
#include "Runtime/Text/Format.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/Shim/Classes/LUMLoggingReroutingZEBLogger.h"

using namespace rt::literals;

namespace {

void importFile(const rt::String& file, int entries) {
  ZEBLogInfo("importing %@", file);
  if (entries == 0) ZEBLogError("%@ has no entries", file);
  ZEBLogInfo("%d entries", entries);
}

// Counts lines.
class LineCount final : public rt::Implements<LineCount, rt::Object, ZEBLogWriter> {
 public:
  void logMessage(const rt::String& /*message*/, ZEBLogLevel /*level*/) override { ++count; }
  int count = 0;
};

// Prints the messages of structured logging.
class Printer final : public rt::Implements<Printer, rt::Object, LUMSyncLogger> {
 public:
  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override {
    rt::FileHandle::standardOutput()->writeLine(rt::format("level %lu in %@: %@"_s, message->level(),
                                                           message->function(), message->formattedString()));
  }
  rt::Ref<LUMLogFilter> filter() const override { return nullptr; }
};

void reroute() {
  const rt::Ref<LUMLogMultiplexer> multiplexer = LUMLogMultiplexer::initWithSystemLogger(nullptr);
  multiplexer->addSyncLogger(rt::make<Printer>());
  ZEBLogger::setSharedLogger(LUMLoggingReroutingZEBLogger::initWithLogMultiplexer(multiplexer));
}

}  // namespace

int main(int count, char** arguments) {
  if (count > 1 && std::string_view(arguments[1]) == "rerouted") reroute();
  importFile("first.txt"_s, 2);
  importFile("empty.txt"_s, 0);

  // Another logger, without a filter: it writes to standard output and to a writer of the host's own.
  const rt::Ref<LineCount> lines = rt::make<LineCount>();
  const rt::Ref<ZEBLogger> logger = ZEBLogger::loggerWithWriter(
      ZEBArrayCompositeLogWriter::of(rt::FileHandle::standardOutput(), lines), nullptr, nullptr);
  logger->logDebug("nothing but the message"_s);
  logger->logInfo("%d line so far"_s, lines->count);
}
