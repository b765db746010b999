#pragma once

/// Makes LUMLogCrash write the crash to an output of its own, which then also writes what it has buffered. An
/// output needs this only if it is used without a LUMBoundedLogger and without a LUMRingLogger in front.
///
///     class Buffered final : public rt::Implements<Buffered, LUMLogOutput> {
///      public:
///       Buffered() : Implements(nullptr) {}
///       void logWithMessage(const rt::Ref<LUMLogMessage>& message) override;
///       void logInSignalHandler(const LUMLogMessage& message) noexcept override;
///
///      private:
///       std::array<char, 4096> buffer_{};
///       const LUMLogCrashOutput crashOutput_{*this};   // the last member, so that the others live longer
///     };
///
/// Threads: any thread may make and destroy one. Destroying it waits while a crash is being written.
///
/// Not for: outputs that write each message at once and need no line about the crash.

#include "Runtime/Base/Visibility.h"
#include "Shared/Logging/Loggers/LUMLogOutput.h"
#include "Shared/Logging/Loggers/Private/LUMLogCrashEntry.h"

class RT_VISIBLE LUMLogCrashOutput final : private LUMLogCrashEntry {
 public:
  /// `output` outlives this object.
  explicit LUMLogCrashOutput(LUMLogOutput& output) noexcept : output_(output) { join(); }
  ~LUMLogCrashOutput() { leave(); }
  LUMLogCrashOutput(const LUMLogCrashOutput&) = delete;
  LUMLogCrashOutput& operator=(const LUMLogCrashOutput&) = delete;

 private:
  const LUMLogOutput* crashSelf() const noexcept override { return &output_; }
  LUMLogOutput* crashTarget() const noexcept override { return &output_; }
  void writeAfterCrash(Losses& /*losses*/) noexcept override {}

  LUMLogOutput& output_;
};
