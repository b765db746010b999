// A host that is built against the installed libraries only. It logs a number to its own logger.
#include "Shared/Logging/Logging.h"

#include <cstdio>

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
  LUMLogAt(LUMLogLevelInfo, "%d"_s, 42);
  return 0;
}
