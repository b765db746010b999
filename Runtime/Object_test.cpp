#include "Runtime/Object.h"

#include <gtest/gtest.h>

#include "Runtime/Class.h"
#include "Runtime/Ref.h"
#include "Runtime/Weak.h"

namespace {

struct Clock : rt::Protocol<Clock> {
  virtual int now() const = 0;

 protected:
  ~Clock() = default;
};

struct AlarmClock : rt::Protocol<AlarmClock, Clock> {
  virtual void ring() = 0;

 protected:
  ~AlarmClock() = default;
};

struct Closing : rt::Protocol<Closing> {
 protected:
  ~Closing() = default;
};

class SystemClock : public rt::Implements<SystemClock, rt::Object, Closing, AlarmClock> {
 public:
  explicit SystemClock(int now) : now_(now) {}
  int now() const override { return now_; }
  void ring() override { ++now_; }

 private:
  int now_;
};

class QuartzClock final : public rt::Implements<QuartzClock, SystemClock> {
 public:
  using Implements::Implements;
};

class Named final : public rt::Implements<Named, rt::Object> {
 public:
  static constexpr std::string_view kClassName = "SRLNamed";
};

TEST(Object, StartsWithOneReference) {
  rt::Ref<Clock> clock = rt::make<QuartzClock>(3);
  EXPECT_EQ(clock->now(), 3);
  rt::Weak<Clock> weak = clock;
  EXPECT_EQ(weak.lock()->now(), 3);
  clock = nullptr;
  EXPECT_FALSE(weak.lock());
}

TEST(Class, IsFoundByName) {
  EXPECT_EQ(rt::classNamed("QuartzClock"), &rt::classInfo<QuartzClock>());
  EXPECT_EQ(rt::classNamed("SRLNamed"), &rt::classInfo<Named>());
  EXPECT_EQ(rt::classNamed("Object"), &rt::classInfo<rt::Object>());
  EXPECT_EQ(rt::protocolNamed("AlarmClock"), &rt::protocolInfo<AlarmClock>());
  EXPECT_EQ(rt::protocolNamed("Closing"), &rt::protocolInfo<Closing>());
  EXPECT_EQ(rt::protocolInfo<AlarmClock>().inherited, &rt::protocolInfo<Clock>());
}

TEST(Class, Casts) {
  rt::Ref<rt::Object> object = rt::make<QuartzClock>(3);
  EXPECT_EQ(rt::cast<Clock>(object)->now(), 3);
  EXPECT_EQ(rt::cast<SystemClock>(object).get(), object.get());
  EXPECT_FALSE(rt::cast<Named>(object));
  rt::cast<AlarmClock>(object)->ring();
  EXPECT_EQ(rt::cast<Clock>(object)->now(), 4);
}

}  // namespace
