#pragma once

/// Settings for the call stacks that an application's messages carry.
///
///     LUMLogMultiplexer::sharedInstance()->setCaptureCallStackAddresses(false);       // names instead
///
/// Threads: other threads see a change eventually.
///
/// Not for: the call stack of a single message. A setting applies to every message logged after the change.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"

struct RT_VISIBLE LUMLogAppControl : rt::Protocol<LUMLogAppControl> {
  /// Return and set whether messages of levels 3 and 4 carry a call stack.
  virtual bool captureCallStack() const = 0;
  virtual void setCaptureCallStack(bool capture) = 0;

  /// Return and set what that call stack holds: addresses (LUMLogAddressCallstack) if true, or names
  /// (LUMLogSymbolCallstack) if false.
  virtual bool captureCallStackAddresses() const = 0;
  virtual void setCaptureCallStackAddresses(bool capture) = 0;

  /// Return and set a value that is stored but has no effect here.
  virtual bool captureSwiftCallStackOnErrorAndAbove() const = 0;
  virtual void setCaptureSwiftCallStackOnErrorAndAbove(bool capture) = 0;

 protected:
  ~LUMLogAppControl() = default;
};
