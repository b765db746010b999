#include "Runtime/Objects/Ref.h"

#include <gtest/gtest.h>

#include <array>
#include <random>
#include <thread>
#include <type_traits>
#include <unordered_set>
#include <utility>
#include <vector>

#include "tests/support/AllocationCount.h"
#include "tests/support/TestClocks.h"

namespace {

struct Closing : rt::Protocol<Closing> {
 protected:
  ~Closing() = default;
};

class SystemClock : public rt::Implements<SystemClock, rt::Object, Closing, AlarmClock> {
 public:
  static int living;

  explicit SystemClock(int now = 0) : now_(now) { ++living; }
  ~SystemClock() override { --living; }
  int now() const override { return now_; }
  int alarm() const override { return now_ + 1; }

 private:
  int now_;
};
int SystemClock::living = 0;

class QuartzClock final : public rt::Implements<QuartzClock, SystemClock> {
 public:
  using Implements::Implements;
};

// Conforms to one protocol only. So its conversions to `Object` and to a protocol are not ambiguous.
class Sundial final : public rt::Implements<Sundial, rt::Object, Clock> {
 public:
  int now() const override { return 12; }
};

class Declared;

struct HolderOfDeclared {
  rt::Ref<Declared> declared;
  HolderOfDeclared();
  ~HolderOfDeclared();
};

template <class From, class To>
concept Converts = std::is_convertible_v<rt::Ref<From>, rt::Ref<To>>;

static_assert(sizeof(rt::Ref<SystemClock>) == sizeof(void*));
static_assert(sizeof(rt::Ref<Clock>) == sizeof(void*));
static_assert(std::is_nothrow_move_constructible_v<rt::Ref<Clock>>);
static_assert(Converts<SystemClock, const SystemClock> && !Converts<const SystemClock, SystemClock>);
static_assert(Converts<QuartzClock, Clock> && !Converts<Clock, QuartzClock>);
static_assert(!Converts<Clock, AlarmClock> && !Converts<Sundial, Closing>);

TEST(Ref, IsNullUntilItRefers) {
  const rt::Ref<Clock> ref;
  EXPECT_FALSE(ref);
  EXPECT_TRUE(ref == nullptr);
  EXPECT_EQ(ref.get(), nullptr);
  EXPECT_EQ(ref, rt::Ref<Clock>(nullptr));
  EXPECT_FALSE(rt::Ref<SystemClock>(static_cast<SystemClock*>(nullptr)));
  EXPECT_FALSE(rt::Ref<rt::Object>(ref));
}

TEST(Ref, KeepsTheObjectAlive) {
  rt::Ref<SystemClock> ref = rt::make<SystemClock>(7);
  rt::Ref<SystemClock> copy = ref;
  EXPECT_EQ(copy, ref);
  ref = nullptr;
  EXPECT_EQ(SystemClock::living, 1);
  EXPECT_EQ(copy->now(), 7);
  EXPECT_EQ((*copy).now(), 7);
  copy = nullptr;
  EXPECT_EQ(SystemClock::living, 0);
}

TEST(Ref, LeavesNullBehindWhenMoved) {
  rt::Ref<SystemClock> ref = rt::make<SystemClock>(7);
  const rt::Ref<SystemClock> moved = std::move(ref);
  EXPECT_FALSE(ref);  // NOLINT(bugprone-use-after-move)
  rt::Ref<QuartzClock> quartz = rt::make<QuartzClock>(8);
  const rt::Ref<Clock> asProtocol = std::move(quartz);
  EXPECT_FALSE(quartz);  // NOLINT(bugprone-use-after-move)
  EXPECT_EQ(asProtocol->now(), 8);
  EXPECT_EQ(SystemClock::living, 2);
}

TEST(Ref, MayBeAssignedToItself) {
  rt::Ref<SystemClock> ref = rt::make<SystemClock>(7);
  auto& same = ref;
  ref = same;
  EXPECT_EQ(ref->now(), 7);
  ref = std::move(same);
  EXPECT_EQ(ref->now(), 7);
  ref = ref.get();
  EXPECT_EQ(ref->now(), 7);
}

TEST(Ref, ConvertsToBasesAndProtocols) {
  const rt::Ref<QuartzClock> quartz = rt::make<QuartzClock>(7);
  const rt::Ref<SystemClock> asSuperclass = quartz;
  const rt::Ref<rt::Object> asRoot = quartz;
  const rt::Ref<AlarmClock> asProtocol = quartz;
  const rt::Ref<Clock> asInherited = quartz;
  const rt::Ref<Clock> fromProtocol = asProtocol;
  const rt::Ref<Closing> asOther = quartz;
  EXPECT_EQ(asProtocol->alarm(), 8);
  EXPECT_EQ(fromProtocol->now(), 7);
  EXPECT_EQ(asSuperclass, quartz);
  EXPECT_EQ(asRoot, quartz);
  EXPECT_EQ(asInherited, fromProtocol);
  EXPECT_EQ(asOther->asObject(), asRoot.get());
}

TEST(Ref, ConvertsFromProtocolToObject) {
  const rt::Ref<Clock> clock = rt::make<SystemClock>(7);
  const rt::Ref<rt::Object> object = clock;
  EXPECT_EQ(object, clock->asObject());
  EXPECT_TRUE(object->isKindOf(rt::classInfo<SystemClock>()));
  const rt::Ref<Sundial> sundial = rt::make<Sundial>();
  const rt::Ref<rt::Object> fromClass = sundial;
  EXPECT_EQ(fromClass, sundial);
}

TEST(Ref, CountsThroughAProtocol) {
  rt::Ref<Clock> clock = rt::make<SystemClock>();
  {
    const rt::Ref<Clock> copy = clock;
    clock = nullptr;
    EXPECT_EQ(SystemClock::living, 1);
  }
  EXPECT_EQ(SystemClock::living, 0);
}

TEST(Ref, AdoptsAndDetaches) {
  rt::Ref<SystemClock> ref = rt::Ref<SystemClock>::adopt(new SystemClock(7));
  SystemClock* const detached = ref.detach();
  EXPECT_FALSE(ref);
  EXPECT_EQ(SystemClock::living, 1);
  ref = rt::Ref<SystemClock>::adopt(detached);
  ref = nullptr;
  EXPECT_EQ(SystemClock::living, 0);
  EXPECT_FALSE(rt::Ref<SystemClock>::adopt(nullptr));
}

TEST(Ref, IsConsistentWhenADestructorReadsIt) {
  class Looking final : public rt::Implements<Looking, rt::Object> {
   public:
    Looking(rt::Ref<rt::Object>& place, bool& sawNull) : place_(place), sawNull_(sawNull) {}
    ~Looking() override {
      sawNull_ = place_ == nullptr;
      place_ = rt::make<SystemClock>();
    }

   private:
    rt::Ref<rt::Object>& place_;
    bool& sawNull_;
  };
  bool sawNull = false;
  {
    rt::Ref<rt::Object> place;
    place = rt::make<Looking>(place, sawNull);
    place = nullptr;
    EXPECT_TRUE(sawNull);
    EXPECT_TRUE(rt::cast<SystemClock>(place));
  }
  EXPECT_EQ(SystemClock::living, 0);
}

TEST(Ref, IsHashedByIdentity) {
  const rt::Ref<SystemClock> one = rt::make<SystemClock>(7);
  const rt::Ref<SystemClock> another = rt::make<SystemClock>(7);
  std::unordered_set<rt::Ref<SystemClock>> set{one, another, one};
  EXPECT_EQ(set.size(), 2U);
  EXPECT_TRUE(set.contains(another));
}

TEST(Ref, MayReferToAClassThatIsOnlyDeclared) {
  const HolderOfDeclared holder;
  EXPECT_TRUE(holder.declared);
}

TEST(Ref, AllocatesNothingButTheObject) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations on this system";
  const AllocationCount count;
  const rt::Ref<SystemClock> ref = rt::make<SystemClock>(7);
  EXPECT_EQ(count.allocations(), 1);
  const rt::Ref<SystemClock> copy = ref;  // NOLINT(performance-unnecessary-copy-initialization)
  const rt::Ref<Clock> asProtocol = copy;
  const rt::Ref<rt::Object> asObject = asProtocol;
  EXPECT_TRUE(rt::cast<AlarmClock>(asObject));
  EXPECT_EQ(count.allocations(), 1);
}

// The model knows for each object how many references exist. An object without references must be gone. An
// object with a reference must be alive.
TEST(Ref, CountsLikeTheModel) {
  constexpr std::size_t kRefs = 16;
  constexpr std::size_t kObjects = 8;
  std::mt19937 random(20240229);  // the same each time
  const auto pick = [&random](std::size_t count) { return random() % count; };

  std::array<rt::Ref<SystemClock>, kRefs> classRefs;
  std::array<rt::Ref<Clock>, kRefs> protocolRefs;
  std::array<int, kRefs> classModel;
  std::array<int, kRefs> protocolModel;
  classModel.fill(-1);
  protocolModel.fill(-1);
  const auto expectedLiving = [&] {
    std::unordered_set<int> distinct(classModel.begin(), classModel.end());
    distinct.insert(protocolModel.begin(), protocolModel.end());
    distinct.erase(-1);
    return static_cast<int>(distinct.size());
  };
  int made = 0;
  for (int step = 0; step < 5000; ++step) {
    const std::size_t to = pick(kRefs);
    const std::size_t from = pick(kRefs);
    switch (pick(7)) {
      case 0:
        if (expectedLiving() < static_cast<int>(kObjects)) {
          classRefs[to] = rt::make<SystemClock>(made);
          classModel[to] = made++;
        }
        break;
      case 1:
        classRefs[to] = classRefs[from];
        classModel[to] = classModel[from];
        break;
      case 2:
        protocolRefs[to] = classRefs[from];
        protocolModel[to] = classModel[from];
        break;
      case 3:
        protocolRefs[to] = std::move(classRefs[from]);
        protocolModel[to] = std::exchange(classModel[from], -1);
        break;
      case 4:
        classRefs[to] = rt::cast<SystemClock>(protocolRefs[from]);
        classModel[to] = protocolModel[from];
        break;
      case 5:
        classRefs[to] = nullptr;
        classModel[to] = -1;
        break;
      default:
        protocolRefs[to] = nullptr;
        protocolModel[to] = -1;
        break;
    }
    ASSERT_EQ(SystemClock::living, expectedLiving()) << "after step " << step;
    ASSERT_EQ(classRefs[to] ? classRefs[to]->now() : -1, classModel[to]) << "after step " << step;
    ASSERT_EQ(protocolRefs[to] ? protocolRefs[to]->now() : -1, protocolModel[to]) << "after step " << step;
  }
}

// Every thread copies and drops references to one object through a class, a protocol and the root. The object
// lives as long as a thread has a reference, and is gone afterwards.
TEST(Ref, IsCopiedByManyThreads) {
  rt::Ref<SystemClock> shared = rt::make<SystemClock>(7);
  std::vector<std::jthread> threads;
  threads.reserve(4);
  for (int i = 0; i < 4; ++i) {
    threads.emplace_back([clock = shared] {
      for (int round = 0; round < 5000; ++round) {
        const rt::Ref<Clock> asProtocol = clock;
        const rt::Ref<rt::Object> asObject = asProtocol;
        if (rt::cast<SystemClock>(asObject)->now() != 7) std::abort();
      }
    });
  }
  shared = nullptr;
  threads.clear();
  EXPECT_EQ(SystemClock::living, 0);
}

class Declared final : public rt::Implements<Declared, rt::Object> {};
HolderOfDeclared::HolderOfDeclared() : declared(rt::make<Declared>()) {}
HolderOfDeclared::~HolderOfDeclared() = default;

}  // namespace
