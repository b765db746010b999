// A logger with a weak reference to its delegate. It calls the delegate while the delegate exists.

#include <cstdio>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Objects/Weak.h"

using namespace rt::literals;

struct LoggerDelegate : rt::Protocol<LoggerDelegate> {
  virtual void didLog(const rt::String& message) = 0;

 protected:
  ~LoggerDelegate() = default;
};

class Logger final : public rt::Implements<Logger, rt::Object> {
 public:
  void setDelegate(const rt::Ref<LoggerDelegate>& delegate) { delegate_ = delegate; }

  // Returns whether there was a delegate to call.
  bool log(const rt::String& message) {
    // The strong reference keeps the delegate alive during the call.
    const rt::Ref<LoggerDelegate> delegate = delegate_.lock();
    if (!delegate) return false;
    delegate->didLog(message);
    return true;
  }

 private:
  rt::Weak<LoggerDelegate> delegate_;
};

class Printer final : public rt::Implements<Printer, rt::Object, LoggerDelegate> {
 public:
  void didLog(const rt::String& message) override {
    std::printf("logged: %.*s\n", static_cast<int>(message.length()), message.view().data());
  }
};

int main() {
  const rt::Ref<Logger> logger = rt::make<Logger>();
  rt::Ref<Printer> printer = rt::make<Printer>();
  logger->setDelegate(printer);
  logger->log("started"_s);
  printer = nullptr;
  std::printf("%s\n", logger->log("stopped"_s) ? "somebody was told" : "nobody was told");
}
