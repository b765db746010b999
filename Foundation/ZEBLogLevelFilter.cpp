// A filter that is destroyed while it still watches fails an assertion in its destructor. If the thread's
// handler returns, the program goes on. The default handler throws. That ends the program, after the handler
// has said why.

#include "Foundation/ZEBLogLevelFilter.h"

#include "Runtime/Process/AssertionHandler.h"
#include "Runtime/Process/Process.h"

using namespace rt::literals;

namespace {

// The name of both the environment variable and the user default.
constexpr const char* kSettingName = "ZEBVerboseLogging";

bool isYes(const rt::String& value) {
  const rt::String text = value.trimmed().uppercased();
  return text.hasPrefix("Y") || text.hasPrefix("T") || text.integerValue() != 0;
}

}  // namespace

rt::Ref<ZEBLogLevelFilter> ZEBLogLevelFilter::init() {
  return rt::Ref<ZEBLogLevelFilter>::adopt(new ZEBLogLevelFilter());
}

ZEBLogLevelFilter::~ZEBLogLevelFilter() {
  if (!observation_) return;
  rt::AssertionHandler::currentHandler()->handleFailureInFunction(
      "-[ZEBLogLevelFilter dealloc]"_s, "Foundation/ZEBLogger"_s, 544,
      "The user defaults instance is still retained, which means there was a missing `willDetachFromLogger` "
      "call. It is important to balance the `didAttachToLogger` call with a `willDetachFromLogger` call "
      "because "
      "those methods register/unregister the `ZEBLogLevelFilter` instance as an observer of the user "
      "defaults "
      "instance."_s);
}

bool ZEBLogLevelFilter::filterAllowsMessage(const rt::String& /*message*/, ZEBLogLevel level) {
  if (level == ZEBLogLevelInfo) return verboseLoggingEnabled();
  return level != ZEBLogLevelDebug;
}

void ZEBLogLevelFilter::didAttachToLogger() {
  const rt::LockGuard guard(lock_);
  if (observation_) return;
  const rt::Ref<rt::UserDefaults> userDefaults = rt::UserDefaults::standardUserDefaults();
  observation_ = userDefaults->observe(kSettingName, rt::UserDefaults::Notify::kAlsoNow,
                                       [this, defaults = userDefaults.get()] { readSetting(defaults); });
}

void ZEBLogLevelFilter::willDetachFromLogger() {
  const rt::LockGuard guard(lock_);
  observation_.remove();
}

void ZEBLogLevelFilter::readSetting(const rt::UserDefaults* userDefaults) {
  const rt::String value = rt::Process::environmentValue(kSettingName);
  const bool isOn = value ? isYes(value) : userDefaults != nullptr && userDefaults->boolForKey(kSettingName);
  verboseLoggingEnabled_.store(isOn, std::memory_order_relaxed);
}
