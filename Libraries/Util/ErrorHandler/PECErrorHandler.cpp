// The handler has two locks. The callback runs under a recursive one, because it may log an error itself. The
// callback is read and set under the other one, so that tests that set it directly wait for nobody.

#include "Libraries/Util/ErrorHandler/PECErrorHandler.h"

#include <string_view>
#include <utility>

#include "Libraries/Util/ErrorHandler/PECReport.h"
#include "Runtime/Locks/Lazy.h"
#include "Runtime/Objects/Exception.h"
#include "Runtime/Process/AssertionHandler.h"
#include "Runtime/Text/Format.h"
#include "Shared/Logging/LUMLogLevel.h"
#include "Shared/Logging/LUMLogMinimumLevelFilter.h"
#include "Shared/Logging/LUMLogMultiplexer.h"

namespace {

using namespace rt::literals;

constexpr const char* kFile = "Libraries/Util/ErrorHandler/PECErrorHandler";
constexpr const char* kRegisterErrorHandlerBlock = "-[PECErrorHandler registerErrorHandlerBlock:]";

void failAssertion(const rt::Ref<PECErrorDescription>& error) {
  // Shows the format and not the message, so that all crash reports of one kind have the same first line.
  const rt::String description = rt::format(
      "\n\n\n   <<< ERROR!    <(\u2022\u0300_\u2022\u0301)>    ERROR! >>>\n\n   in %@\n   in %@\n"
      "   Line %tu says:\n\n   %@\n\n\n",
      error->filePath().lastPathComponent(), error->functionName(), error->lineNumber(),
      error->rawFormatString());
  rt::AssertionHandler::currentHandler()->handleFailureInFunction(
      "-[PECErrorHandler defaultErrorHandlerBlock]_block_invoke"_s, rt::String::overStatic(kFile), 64,
      description);
}

// Marks that an error callback runs on this thread. Scopes may nest.
class CallbackScope {
 public:
  CallbackScope() noexcept { ++depth_; }
  CallbackScope(const CallbackScope&) = delete;
  CallbackScope& operator=(const CallbackScope&) = delete;
  ~CallbackScope() { --depth_; }

  static bool isEntered() noexcept { return depth_ > 0; }

 private:
  static constinit thread_local int depth_;
};

constinit thread_local int CallbackScope::depth_ = 0;

[[noreturn]] void failExpectation(const rt::String& reason) {
  throw rt::Exception("Assertion Failed!"_s, reason);
}

}  // namespace

const rt::Ref<PECErrorHandler>& PECErrorHandler::sharedInstance() {
  static constinit rt::Lazy<rt::Ref<PECErrorHandler>> instance;
  return instance.get(init);
}

void PECErrorHandler::register_() {
  static constinit rt::Lazy<bool> isRegistered;
  isRegistered.get([] {
    LUMLogMultiplexer::sharedInstance()->addSyncLogger(sharedInstance());
    return true;
  });
}

rt::Ref<PECErrorHandler> PECErrorHandler::init() {
  return rt::Ref<PECErrorHandler>::adopt(new PECErrorHandler);
}

PECErrorHandler::PECErrorHandler()
    : filter_(LUMLogMinimumLevelFilter::initWithMinimumLevel(LUMLogLevelFault)) {}

void PECErrorHandler::logWithMessage(const rt::Ref<LUMLogMessage>& message) {
  const rt::Ref<PECErrorDescription> error = rt::make<PECErrorDescription>();
  error->setFilePath(message->file());
  error->setFunctionName(message->function());
  error->setLineNumber(message->line());
  error->setRawFormatString(message->format());
  error->setErrorMessage(message->formattedString());

  // Released after the lock if it is the last reference: the callback may have captured anything.
  PECErrorHandlerBlock block;
  const rt::LockGuard guard(lock_);
  block = errorHandlerBlock();
  {
    const CallbackScope scope;
    (block ? block : defaultErrorHandlerBlock())(error);
  }
  errorCount_.fetch_add(1, std::memory_order_relaxed);
}

bool PECErrorHandler::isCallingBack() noexcept {
  return CallbackScope::isEntered();
}

void PECErrorHandler::registerErrorHandlerBlock(PECErrorHandlerBlock block) {
  if (!block) {
    PECReport({kFile, kRegisterErrorHandlerBlock, 70}, "|errorHandlerBlock| cannot be nil!."_s);
    return;
  }
  const rt::LockGuard guard(lock_);
  if (errorHandlerBlock()) {
    PECReport({kFile, kRegisterErrorHandlerBlock, 72}, "An ErrorHandlerBlock was already set!."_s);
    return;
  }
  setErrorHandlerBlock(std::move(block));
}

PECErrorHandlerBlock PECErrorHandler::defaultErrorHandlerBlock() {
  return [](const rt::Ref<PECErrorDescription>& error) { failAssertion(error); };
}

PECErrorHandlerBlock PECErrorHandler::errorHandlerBlock() const {
  const rt::LockGuard guard(blockLock_);
  return errorHandlerBlock_;
}

void PECErrorHandler::setErrorHandlerBlock(PECErrorHandlerBlock block) {
  // The old callback is released after the lock, because it may have captured anything.
  PECErrorHandlerBlock replaced;
  const rt::LockGuard guard(blockLock_);
  replaced = std::exchange(errorHandlerBlock_, std::move(block));
}

void PECErrorHandler::resetAfterTest() {
  sharedInstance()->setErrorHandlerBlock(nullptr);
  sharedInstance()->setErrorCount(0);
}

std::int32_t PECErrorHandler::errorCountInBlock(const rt::Block<void()>& block) {
  PECErrorHandler& handler = *sharedInstance();
  const std::int32_t before = handler.errorCount();
  PECErrorHandlerBlock kept = handler.errorHandlerBlock();
  handler.setErrorHandlerBlock([](const rt::Ref<PECErrorDescription>&) {});
  block();
  handler.setErrorHandlerBlock(std::move(kept));
  // Computed modulo 2^32, because the count may wrap around.
  return static_cast<std::int32_t>(static_cast<std::uint32_t>(handler.errorCount()) -
                                   static_cast<std::uint32_t>(before));
}

void PECErrorHandler::assertBlockReportsError(const rt::Block<void()>& block) {
  if (errorCountInBlock(block) == 0) {
    failExpectation("\n\n     <(\u2022\u0300_\u2022\u0301)>     Expected block to report an error!\n\n"_s);
  }
}

void PECErrorHandler::assertBlockDoesNotReportError(const rt::Block<void()>& block) {
  if (errorCountInBlock(block) > 0) {
    failExpectation("\n\n     <(\u2022\u0300_\u2022\u0301)>     Expected block to report no errors!\n\n"_s);
  }
}
