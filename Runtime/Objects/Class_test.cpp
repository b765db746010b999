#include "Runtime/Objects/Class.h"

#include <gtest/gtest.h>

#include <string>
#include <string_view>
#include <type_traits>
#include <vector>

#include "Runtime/Objects/Ref.h"
#include "tests/support/AllocationCount.h"
#include "tests/support/StandardErrorPipe.h"
#include "tests/support/TestClocks.h"

namespace {

struct Stopwatch : rt::Protocol<Stopwatch, Clock> {
  virtual int elapsed() const = 0;

 protected:
  ~Stopwatch() = default;
};

struct Empty : rt::Protocol<Empty> {
 protected:
  ~Empty() = default;
};

struct Unused : rt::Protocol<Unused> {
 protected:
  ~Unused() = default;
};

class SystemClock : public rt::Implements<SystemClock, rt::Object, Empty, AlarmClock> {
 public:
  explicit SystemClock(int now = 1) : now_(now) {}
  int now() const override { return now_; }
  int alarm() const override { return now_ + 1; }

 private:
  int now_;
};

// Inherits `Clock` twice: by its own protocol and by its superclass's.
class QuartzClock : public rt::Implements<QuartzClock, SystemClock, Stopwatch> {
 public:
  using Implements::Implements;
  int now() const override { return 5; }
  int elapsed() const override { return 6; }
};

class Watch final : public rt::Implements<Watch, QuartzClock> {};

class Stone final : public rt::Implements<Stone, rt::Object> {};

template <class Content>
class Box final : public rt::Implements<Box<Content>, rt::Object> {};

template <class Content>
class NamedBox : public rt::Implements<NamedBox<Content>, rt::Object> {
 public:
  static constexpr std::string_view kClassName = "BoxByAnotherName";
};

// Has its name in the source, although its superclass states another name.
class Crate final : public rt::Implements<Crate, NamedBox<int>> {};

class Chest final : public rt::Implements<Chest, NamedBox<int>> {
 public:
  static constexpr std::string_view kClassName = "SRLChest";
};

struct Marked : rt::Protocol<Marked> {
  static constexpr std::string_view kProtocolName = "SRLMarked";

 protected:
  ~Marked() = default;
};

struct MoreMarked : rt::Protocol<MoreMarked, Marked> {
 protected:
  ~MoreMarked() = default;
};

struct Outer {
  class Inner final : public rt::Implements<Inner, rt::Object> {};
};

// Static objects look names up while the program is being loaded.
const bool isKnownToStaticObjects =
    rt::classNamed("Stone") != nullptr && rt::protocolNamed("Clock") != nullptr;

static_assert(rt::ClassType<rt::Object> && rt::ClassType<SystemClock> && rt::ClassType<const SystemClock>);
static_assert(rt::ProtocolType<Clock> && rt::ProtocolType<AlarmClock> && !rt::ProtocolType<SystemClock>);
static_assert(!rt::ClassType<Clock> && !rt::ClassType<int> && !rt::ProtocolType<rt::AnyProtocol>);

TEST(Class, HasItsNameInTheSource) {
  EXPECT_EQ(rt::classInfo<SystemClock>().name, "SystemClock");
  EXPECT_EQ(rt::classInfo<rt::Object>().name, "Object");
  EXPECT_EQ(rt::classInfo<Outer::Inner>().name, "Inner");
  EXPECT_EQ(rt::classInfo<Box<int>>().name, "Box<int>");
  class Local final : public rt::Implements<Local, rt::Object> {};
  EXPECT_EQ(rt::classInfo<Local>().name, "Local");
  EXPECT_EQ(rt::protocolInfo<Clock>().name, "Clock");
}

TEST(Class, HasTheNameThatItStates) {
  EXPECT_EQ(rt::classInfo<NamedBox<int>>().name, "BoxByAnotherName");
  EXPECT_EQ(rt::classInfo<Crate>().name, "Crate");
  EXPECT_EQ(rt::classInfo<Chest>().name, "SRLChest");
  EXPECT_EQ(rt::protocolInfo<Marked>().name, "SRLMarked");
  EXPECT_EQ(rt::protocolInfo<MoreMarked>().name, "MoreMarked");
}

TEST(Class, IsFoundByName) {
  EXPECT_TRUE(isKnownToStaticObjects);
  EXPECT_EQ(rt::classNamed("Object"), &rt::classInfo<rt::Object>());
  EXPECT_EQ(rt::classNamed("QuartzClock"), &rt::classInfo<QuartzClock>());
  EXPECT_EQ(rt::classNamed("SRLChest"), &rt::classInfo<Chest>());
  EXPECT_EQ(rt::classNamed("Box<int>"), &rt::classInfo<Box<int>>());
  EXPECT_EQ(rt::protocolNamed("Clock"), &rt::protocolInfo<Clock>());
  EXPECT_EQ(rt::protocolNamed("Stopwatch"), &rt::protocolInfo<Stopwatch>());
  EXPECT_EQ(rt::protocolNamed("SRLMarked"), &rt::protocolInfo<Marked>());
}

TEST(Class, IsNotFoundByAnotherName) {
  for (const std::string_view name : {"", "object", "Object ", "QuartzCloc", "Chest", "Clock"}) {
    EXPECT_EQ(rt::classNamed(name), nullptr) << name;
  }
  for (const std::string_view name : {"", "SystemClock", "AnyProtocol", "Marked"}) {
    EXPECT_EQ(rt::protocolNamed(name), nullptr) << name;
  }
  EXPECT_EQ(rt::classNamed(std::string_view("Stone\0", 6)), nullptr);
}

TEST(Class, KnowsItsSuperclasses) {
  EXPECT_EQ(rt::classInfo<Watch>().superclass, &rt::classInfo<QuartzClock>());
  EXPECT_EQ(rt::classInfo<rt::Object>().superclass, nullptr);
  EXPECT_TRUE(rt::classInfo<Watch>().isSubclassOf(rt::classInfo<rt::Object>()));
  EXPECT_TRUE(rt::classInfo<Watch>().isSubclassOf(rt::classInfo<Watch>()));
  EXPECT_FALSE(rt::classInfo<SystemClock>().isSubclassOf(rt::classInfo<QuartzClock>()));
  EXPECT_FALSE(rt::classInfo<Stone>().isSubclassOf(rt::classInfo<SystemClock>()));
}

TEST(Class, KnowsItsProtocols) {
  const rt::ClassInfo& watch = rt::classInfo<Watch>();
  EXPECT_TRUE(watch.conformsTo(rt::protocolInfo<Stopwatch>()));
  EXPECT_TRUE(watch.conformsTo(rt::protocolInfo<AlarmClock>()));
  EXPECT_TRUE(watch.conformsTo(rt::protocolInfo<Clock>()));
  EXPECT_TRUE(watch.conformsTo(rt::protocolInfo<Empty>()));
  EXPECT_FALSE(watch.conformsTo(rt::protocolInfo<Unused>()));
  EXPECT_FALSE(rt::classInfo<SystemClock>().conformsTo(rt::protocolInfo<Stopwatch>()));
  EXPECT_FALSE(rt::classInfo<rt::Object>().conformsTo(rt::protocolInfo<Clock>()));
}

TEST(Protocol, KnowsWhatItInherits) {
  EXPECT_EQ(rt::protocolInfo<AlarmClock>().inherited, &rt::protocolInfo<Clock>());
  EXPECT_EQ(rt::protocolInfo<Clock>().inherited, nullptr);
  EXPECT_TRUE(rt::protocolInfo<AlarmClock>().conformsTo(rt::protocolInfo<Clock>()));
  EXPECT_TRUE(rt::protocolInfo<Clock>().conformsTo(rt::protocolInfo<Clock>()));
  EXPECT_FALSE(rt::protocolInfo<Clock>().conformsTo(rt::protocolInfo<AlarmClock>()));
}

TEST(Class, ObjectsAnswerForTheirClass) {
  const rt::Ref<rt::Object> object = rt::make<QuartzClock>();
  EXPECT_EQ(&object->classInfo(), &rt::classInfo<QuartzClock>());
  EXPECT_TRUE(object->isMemberOf(rt::classInfo<QuartzClock>()));
  EXPECT_FALSE(object->isMemberOf(rt::classInfo<SystemClock>()));
  EXPECT_TRUE(object->isKindOf(rt::classInfo<SystemClock>()));
  EXPECT_FALSE(object->isKindOf(rt::classInfo<Watch>()));
  EXPECT_TRUE(object->conformsTo(rt::protocolInfo<Clock>()));
  EXPECT_FALSE(object->conformsTo(rt::protocolInfo<Unused>()));
}

TEST(Cast, IsNullForNull) {
  EXPECT_EQ(rt::cast<Clock>(static_cast<rt::Object*>(nullptr)), nullptr);
  EXPECT_EQ(rt::cast<Stone>(static_cast<Clock*>(nullptr)), nullptr);
  EXPECT_FALSE(rt::cast<Clock>(rt::Ref<rt::Object>()));
}

TEST(Cast, ConvertsToClassesAndProtocols) {
  const rt::Ref<Watch> watch = rt::make<Watch>();
  rt::Object* const object = watch.get();
  EXPECT_EQ(rt::cast<Watch>(object), watch.get());
  EXPECT_EQ(rt::cast<SystemClock>(object), watch.get());
  EXPECT_EQ(rt::cast<rt::Object>(object), object);
  EXPECT_EQ(rt::cast<Stone>(object), nullptr);
  EXPECT_EQ(rt::cast<Unused>(object), nullptr);
  EXPECT_EQ(rt::cast<Empty>(object), static_cast<Empty*>(watch.get()));
  EXPECT_EQ(rt::cast<AlarmClock>(object), static_cast<AlarmClock*>(watch.get()));
  EXPECT_EQ(rt::cast<Stopwatch>(object), static_cast<Stopwatch*>(watch.get()));
  EXPECT_EQ(rt::cast<Clock>(object), static_cast<Clock*>(static_cast<Stopwatch*>(watch.get())))
      << "the class nearest to the object decides by way of which protocol";
  EXPECT_EQ(rt::cast<Stopwatch>(object)->elapsed(), 6);
  EXPECT_EQ(rt::cast<AlarmClock>(object)->alarm(), 2);
  EXPECT_EQ(rt::cast<Clock>(object)->now(), 5);
}

TEST(Cast, ConvertsFromOneProtocolToAnother) {
  const rt::Ref<Watch> watch = rt::make<Watch>();
  Empty* const empty = watch.get();
  EXPECT_EQ(rt::cast<Stopwatch>(empty), static_cast<Stopwatch*>(watch.get()));
  EXPECT_EQ(rt::cast<QuartzClock>(empty), watch.get());
  EXPECT_EQ(rt::cast<Stone>(empty), nullptr);
}

TEST(Cast, KeepsConst) {
  const rt::Ref<Watch> watch = rt::make<Watch>();
  const rt::Object* const object = watch.get();
  static_assert(std::is_same_v<decltype(rt::cast<Clock>(object)), const Clock*>);
  static_assert(std::is_same_v<decltype(rt::cast<Clock>(watch.get())), Clock*>);
  EXPECT_EQ(rt::cast<Clock>(object)->now(), 5);
}

TEST(Cast, AllocatesNothing) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations on this system";
  const rt::Ref<rt::Object> object = rt::make<Watch>();
  const AllocationCount count;
  EXPECT_NE(rt::cast<Clock>(object.get()), nullptr);
  EXPECT_EQ(rt::cast<Stone>(object.get()), nullptr);
  EXPECT_NE(rt::classNamed("Watch"), nullptr);
  EXPECT_EQ(count.allocations(), 0);
}

// A class is announced again when several images of a program have it and the loader uses one record for all
// of them.
TEST(Class, MayBeAnnouncedAgain) {
  static constinit rt::detail::NamedEntry<rt::ClassInfo> entry{&rt::classInfo<Watch>(),
                                                               rt::detail::nameHash("Watch")};
  StandardErrorPipe standardError;
  rt::detail::announce(entry);
  EXPECT_EQ(standardError.text(), "");
  EXPECT_EQ(rt::classNamed("Watch"), &rt::classInfo<Watch>());
}

// The model is dynamic_cast. Tests may use it, although the runtime does not.
TEST(Cast, AgreesWithDynamicCast) {
  const std::vector<rt::Ref<rt::Object>> objects = {rt::make<SystemClock>(), rt::make<QuartzClock>(),
                                                    rt::make<Watch>(),       rt::make<Stone>(),
                                                    rt::make<Box<int>>(),    rt::make<Crate>()};
  for (const auto& ref : objects) {
    rt::Object* const object = ref.get();
    const std::string name(object->classInfo().name);
    EXPECT_EQ(rt::cast<SystemClock>(object), dynamic_cast<SystemClock*>(object)) << name;
    EXPECT_EQ(rt::cast<QuartzClock>(object), dynamic_cast<QuartzClock*>(object)) << name;
    EXPECT_EQ(rt::cast<Watch>(object), dynamic_cast<Watch*>(object)) << name;
    EXPECT_EQ(rt::cast<Stone>(object), dynamic_cast<Stone*>(object)) << name;
    EXPECT_EQ(rt::cast<NamedBox<int>>(object), dynamic_cast<NamedBox<int>*>(object)) << name;
    EXPECT_EQ(rt::cast<Empty>(object), dynamic_cast<Empty*>(object)) << name;
    EXPECT_EQ(rt::cast<AlarmClock>(object), dynamic_cast<AlarmClock*>(object)) << name;
    EXPECT_EQ(rt::cast<Stopwatch>(object), dynamic_cast<Stopwatch*>(object)) << name;
    EXPECT_EQ(rt::cast<Unused>(object), dynamic_cast<Unused*>(object)) << name;
  }
}

}  // namespace
