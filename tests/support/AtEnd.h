#pragma once

/// Runs a function when it is destroyed. A block that captures an `AtEnd` thus shows when its captures are
/// destroyed.
///
///     block = [end = AtEnd([&] { trace.add("gone"); })] {};
///
/// Not for: anything but tests.

#include <functional>
#include <utility>

class AtEnd {
 public:
  explicit AtEnd(std::function<void()> body) : body_(std::move(body)) {}
  AtEnd(const AtEnd&) = delete;
  AtEnd& operator=(const AtEnd&) = delete;
  AtEnd(AtEnd&& other) noexcept : body_(std::exchange(other.body_, nullptr)) {}
  AtEnd& operator=(AtEnd&&) = delete;
  ~AtEnd() {
    if (body_) body_();
  }

 private:
  std::function<void()> body_;
};
