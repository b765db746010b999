#pragma once

/// Two protocols that test classes conform to. AlarmClock inherits Clock.
///
/// Not for: anything but tests and benchmarks.

#include "Runtime/Objects/Class.h"

struct Clock : rt::Protocol<Clock> {
  virtual int now() const = 0;

 protected:
  ~Clock() = default;
};

struct AlarmClock : rt::Protocol<AlarmClock, Clock> {
  virtual int alarm() const = 0;

 protected:
  ~AlarmClock() = default;
};
