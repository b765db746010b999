// How long the stacks exist. They do so when load hooks run. A thread may go on measuring at exit, when they
// are destroyed.

#include <gtest/gtest.h>
#include <unistd.h>

#include <atomic>
#include <cstdint>
#include <cstdlib>
#include <thread>
#include <utility>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/LoadHook.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/ServiceRegistry/Source/Profiling/Private/SRLPProfilingMeasurement.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLProfilingStorage.h"

namespace {

using rt::Ref;

constinit const SRLAPIRegistrationData clockAPI{.identifier = "Clock", .identifierLength = 5};

Ref<SRLImplementation> implementationWith(SRLFactoryBlock factory) {
  return SRLImplementation::initWithIdentifier("SystemClock", nullptr, /*lifetime=*/0, /*scope=*/0,
                                               std::move(factory), nullptr);
}

Ref<SRLImplementation> plainImplementation() {
  return implementationWith([](const SRLScopeTagSet&, bool*) -> Ref<rt::Object> { return nullptr; });
}

constinit bool didHookFindItsParent = false;

}  // namespace

class ProfilingLoadHook final : public rt::Implements<ProfilingLoadHook, rt::Object> {
 public:
  static void load() {
    const Ref<SRLImplementation> implementation = plainImplementation();
    SRLPCaptureInjectionStart(implementation);
    didHookFindItsParent = SRLPCaptureInjectionStart(plainImplementation()).parent == implementation;
    SRLPCaptureInjectionCancel();
    SRLPCaptureInjectionCancel();
  }
};

template struct rt::LoadHook<ProfilingLoadHook>;

namespace {

TEST(SRLPProfilingMeasurementLifetime, StacksExistWhenLoadHooksRun) {
#ifdef __APPLE__
  GTEST_SKIP() << "the order of what runs when a program is loaded is the linker's";
#endif
  EXPECT_TRUE(didHookFindItsParent);
  EXPECT_EQ(SRLPProfilingDetail::countOfStacks(), 0U);
}

// The steps of the program that exits, in order.
enum Step : std::uint8_t {
  kNothing,
  kMeasuring,  // the thread has begun to make something
  kExited,     // all static objects have been destroyed
  kMeasured,   // the thread has gone on
};
constinit std::atomic<int> step{kNothing};
constinit std::atomic<int> problems{0};
constinit std::atomic<bool> isGivenUp{false};

void setStep(Step next) {
  step = next;
  step.notify_all();
}

// Only the stack retains this object, so it is destroyed with the stack.
class LastWords final : public rt::Implements<LastWords, rt::Object> {
 public:
  ~LastWords() override {
    isGivenUp = true;
    // No lock is held, and there are no stacks any more.
    SRLPCaptureInjectionCancel();
  }
};

void goOnMeasuring() {
  SRLPCaptureInjectionStart(implementationWith(
      [words = Ref<rt::Object>(rt::make<LastWords>())](const SRLScopeTagSet&, bool*) { return words; }));
  if (SRLPProfilingDetail::countOfStacks() != 1 || isGivenUp) problems += 1;
  setStep(kMeasuring);

  step.wait(kMeasuring);
  if (SRLPProfilingDetail::countOfStacks() != 0 || !isGivenUp) problems += 10;
  const Ref<SRLImplementation> implementation = plainImplementation();
  const SRLPProfilingMeasurementPartial partial = SRLPCaptureInjectionStart(implementation);
  if (partial.parent || partial.startTime == 0) problems += 20;
  if (SRLPProfilingDetail::countOfStacks() != 0) problems += 40;
  SRLPCaptureInjectionEnd(partial, &clockAPI, implementation);
  if (SRLProfilingStorage::sharedInstance()->serviceInitializationEvents()->count() != 1) problems += 80;
  SRLPCaptureInjectionCancel();
  setStep(kMeasured);
  // The thread ends with the program.
  for (;;) step.wait(kMeasured);
}

// Called after all static objects have been destroyed.
[[gnu::destructor]] void afterStaticObjects() {
  if (step != kMeasuring) return;
  setStep(kExited);
  step.wait(kExited);
  _exit(problems);
}

[[noreturn]] void exitWhileAThreadGoesOn() {
  std::thread(goOnMeasuring).detach();
  step.wait(kNothing);
  // The status shows if the program ended without the function above.
  std::exit(255);
}

TEST(SRLPProfilingMeasurementLifetime, ThreadsMayGoOnMeasuringAtExit) {
#ifdef __APPLE__
  GTEST_SKIP() << "nothing is called after static objects have been destroyed";
#endif
  EXPECT_EXIT(exitWhileAThreadGoesOn(), testing::ExitedWithCode(0), "");
}

}  // namespace
