#pragma once

/// What an application says about call stacks in messages.
///
///     LUMLogMultiplexer::sharedInstance()->setCaptureCallStackAddresses(false);       // names instead
///
/// A change is seen by other threads sooner or later.
///
/// Not for: a call stack of one message only; all that are logged from then on have one, or have none.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"

struct RT_VISIBLE LUMLogAppControl : rt::Protocol<LUMLogAppControl> {
  /// Whether messages of the levels 3 and 4 have a call stack.
  virtual bool captureCallStack() const = 0;
  virtual void setCaptureCallStack(bool capture) = 0;

  /// Whether that is of addresses (LUMLogAddressCallstack) or of names (LUMLogSymbolCallstack).
  virtual bool captureCallStackAddresses() const = 0;
  virtual void setCaptureCallStackAddresses(bool capture) = 0;

  /// Kept for whoever asks; changes nothing here.
  virtual bool captureSwiftCallStackOnErrorAndAbove() const = 0;
  virtual void setCaptureSwiftCallStackOnErrorAndAbove(bool capture) = 0;

 protected:
  ~LUMLogAppControl() = default;
};
