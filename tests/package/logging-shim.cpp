// A host that is built against the installed libraries only. It logs a number through the rerouting older
// logger.
#include <cstdio>

#include "Shared/Logging/Logging.h"
#include "Shared/Logging/Shim/Classes/LUMLoggingReroutingZEBLogger.h"

using namespace rt::literals;

class Printer final : public rt::Implements<Printer, rt::Object, LUMSyncLogger> {
 public:
  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override {
    const std::string_view text = message->formattedString();
    std::printf("%.*s\n", static_cast<int>(text.size()), text.data());
  }
  rt::Ref<LUMLogFilter> filter() const override { return nullptr; }
};

int main() {
  LUMLogMultiplexer::sharedInstance()->addSyncLogger(rt::make<Printer>());
  LUMLoggingReroutingZEBLogger::initWithLogMultiplexer(LUMLogMultiplexer::sharedInstance())
      ->logInfo("%d"_s, 42);
  return 0;
}
