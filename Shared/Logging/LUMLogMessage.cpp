#include "Shared/Logging/LUMLogMessage.h"

#include <utility>

#include "Runtime/Base/Private/WallClock.h"
#include "Runtime/Locks/Private/ThreadIdentifier.h"
#include "Runtime/Process/Thread.h"
#include "Runtime/Queues/Queue.h"

namespace {

using namespace rt::literals;

rt::String currentThreadName() {
  rt::String name = rt::Thread::currentName();
  if (!name) name = ""_s;
  return name;
}

std::uint64_t hashOf(const rt::Object* object) {
  return object != nullptr ? object->hash() : 0;
}

}  // namespace

[[gnu::flatten]] rt::Ref<LUMLogMessage> LUMLogMessage::initWithLevel(
    LUMLogLevel level, rt::String format, rt::String formattedString, rt::String file, rt::String function,
    std::uint64_t line, rt::String threadName, rt::String dispatchQueueLabel,
    const rt::Ref<LUMLogCallstack>& callstack, rt::Ref<rt::Dictionary> safeParameters,
    rt::Ref<LUMLogMetadata> logMetadata) {
  return rt::Ref<LUMLogMessage>::adopt(
      new LUMLogMessage(level, std::move(format), std::move(formattedString), std::move(file),
                        std::move(function), line, std::move(threadName), std::move(dispatchQueueLabel),
                        callstack, std::move(safeParameters), std::move(logMetadata)));
}

LUMLogMessage::LUMLogMessage(LUMLogLevel level, rt::String format, rt::String formattedString,
                             rt::String file, rt::String function, std::uint64_t line, rt::String threadName,
                             rt::String dispatchQueueLabel, const rt::Ref<LUMLogCallstack>& callstack,
                             rt::Ref<rt::Dictionary> safeParameters, rt::Ref<LUMLogMetadata> logMetadata)
    : level_(level),
      format_(std::move(format)),
      formattedString_(std::move(formattedString)),
      file_(std::move(file)),
      function_(std::move(function)),
      line_(line),
      threadName_(threadName ? std::move(threadName) : currentThreadName()),
      dispatchQueueLabel_(dispatchQueueLabel ? std::move(dispatchQueueLabel) : rt::Queue::currentLabel()),
      callstack_(rt::copy(callstack)),
      safeParameters_(std::move(safeParameters)),
      logMetadata_(std::move(logMetadata)),
      time_(rt::WallClock::nanoseconds()),
      threadIdentifier_(rt::currentThreadIdentifier()) {}

bool LUMLogMessage::isEqual(const rt::Object* other) const {
  if (this == other) return true;
  const auto* message = rt::cast<LUMLogMessage>(other);
  return message != nullptr && level_ == message->level_ && line_ == message->line_ &&
         format_ == message->format_ && formattedString_ == message->formattedString_ &&
         file_ == message->file_ && function_ == message->function_ && threadName_ == message->threadName_ &&
         dispatchQueueLabel_ == message->dispatchQueueLabel_ &&
         rt::isEqual(callstack_, message->callstack_) &&
         rt::isEqual(safeParameters_, message->safeParameters_) &&
         rt::isEqual(logMetadata_, message->logMetadata_);
}

std::uint64_t LUMLogMessage::hash() const {
  return level_ + line_ + format_.hash() + formattedString_.hash() + file_.hash() + function_.hash() +
         threadName_.hash() + dispatchQueueLabel_.hash() +
         hashOf(callstack_ ? callstack_->asObject() : nullptr) + hashOf(safeParameters_.get()) +
         hashOf(logMetadata_.get());
}
