// The smallest program that logs: one logger, which prints to standard output, and one message.

#include "Runtime/Process/FileHandle.h"
#include "Shared/Logging/LUMLog.h"
#include "Shared/Logging/LUMLogMultiplexer.h"

using namespace rt::literals;

class Terminal final : public rt::Implements<Terminal, rt::Object, LUMSyncLogger> {
 public:
  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override {
    rt::FileHandle::standardOutput()->writeLine(message->formattedString());
  }
  rt::Ref<LUMLogFilter> filter() const override { return nullptr; }
};

int main() {
  LUMLogMultiplexer::sharedInstance()->addSyncLogger(rt::make<Terminal>());
  LUMLogAt(LUMLogLevelInfo, "%@ has %d entries"_s, "holiday.tar"_s, 3);
}
