#include "Runtime/Objects/Object.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <cstring>
#include <stdexcept>
#include <thread>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "tests/support/AllocationCount.h"

namespace {

// Counts its destructions.
class Noted : public rt::Implements<Noted, rt::Object> {
 public:
  explicit Noted(int& destructions) : destructions_(destructions) {}
  ~Noted() override { ++destructions_; }

 private:
  int& destructions_;
};

class Point final : public rt::Implements<Point, rt::Object> {
 public:
  Point(int x, int y) : x_(x), y_(y) {}
  bool isEqual(const rt::Object* other) const override {
    const Point* point = rt::cast<Point>(other);
    return point != nullptr && point->x_ == x_ && point->y_ == y_;
  }
  std::uint64_t hash() const override {
    return (41 * static_cast<std::uint64_t>(x_)) + static_cast<std::uint64_t>(y_);
  }

 private:
  int x_;
  int y_;
};

class Constant final : public rt::Implements<Constant, rt::Object> {
 public:
  explicit constexpr Constant(int value) : Implements(Immortal()), value_(value) {}
  constexpr ~Constant() override {}  // NOLINT(modernize-use-equals-default)
  int value() const { return value_; }

 private:
  int value_;
};

constexpr Constant kConstant(42);

static_assert(sizeof(rt::Object) == 24, "an object is a vtable, a cell and a count");

TEST(Object, IsDestroyedWithItsLastReference) {
  int destructions = 0;
  const Noted* object = new Noted(destructions);
  object->retain();
  object->release();
  EXPECT_EQ(destructions, 0);
  object->release();
  EXPECT_EQ(destructions, 1);
}

TEST(Object, MayThrowFromItsConstructor) {
  class Refusing final : public rt::Implements<Refusing, Noted> {
   public:
    explicit Refusing(int& destructions) : Implements(destructions) {
      const rt::Ref<Refusing> self = this;
      throw std::runtime_error("refused");
    }
  };
  int destructions = 0;
  EXPECT_THROW(static_cast<void>(rt::make<Refusing>(destructions)), std::runtime_error);
  EXPECT_EQ(destructions, 1);
}

TEST(Object, MayReferToItselfWhileItIsMadeAndDestroyed) {
  class Reflecting final : public rt::Implements<Reflecting, Noted> {
   public:
    explicit Reflecting(int& destructions) : Implements(destructions) { refer(); }
    ~Reflecting() override { refer(); }

   private:
    void refer() {
      const rt::Ref<Reflecting> self = this;
      const rt::Ref<rt::Object> again = self;
    }
  };
  int destructions = 0;
  {
    const rt::Ref<Reflecting> object = rt::make<Reflecting>(destructions);
    EXPECT_EQ(destructions, 0);
  }
  EXPECT_EQ(destructions, 1);
}

TEST(Object, MayStandOnTheStack) {
  int destructions = 0;
  {
    const Noted object(destructions);
    const rt::Ref<const Noted> ref = &object;
  }
  EXPECT_EQ(destructions, 1);
}

TEST(ObjectDeathTest, EndsTheProgramWhenAReferenceEscapesItsDestructor) {
  testing::GTEST_FLAG(death_test_style) = "threadsafe";
  class Escaping final : public rt::Implements<Escaping, rt::Object> {
   public:
    explicit Escaping(rt::Ref<rt::Object>& place) : place_(place) {}
    ~Escaping() override { place_ = this; }

   private:
    rt::Ref<rt::Object>& place_;
  };
  EXPECT_DEATH(
      {
        rt::Ref<rt::Object> place;
        rt::make<Escaping>(place) = nullptr;
      },
      "rt: a reference to the Escaping at 0x[0-9a-f]+ outlives its destructor");
}

TEST(ObjectDeathTest, EndsTheProgramWhenAReferenceOutlivesTheStack) {
  testing::GTEST_FLAG(death_test_style) = "threadsafe";
  EXPECT_DEATH(
      {
        rt::Ref<rt::Object> place;
        Point point(1, 2);
        place = &point;
      },
      "rt: a reference to the object at 0x[0-9a-f]+ outlives its destructor");
}

TEST(Object, IsEqualOnlyToItselfByDefault) {
  int destructions = 0;
  const rt::Ref<Noted> one = rt::make<Noted>(destructions);
  const rt::Ref<Noted> another = rt::make<Noted>(destructions);
  EXPECT_TRUE(one->isEqual(one.get()));
  EXPECT_FALSE(one->isEqual(another.get()));
  EXPECT_FALSE(one->isEqual(nullptr));
  EXPECT_EQ(one->hash(), one->hash());
  EXPECT_NE(one->hash(), another->hash());

  const rt::Ref<Point> point = rt::make<Point>(3, 4);
  EXPECT_TRUE(point->isEqual(rt::make<Point>(3, 4).get()));
  EXPECT_EQ(point->hash(), rt::make<Point>(3, 4)->hash());
  EXPECT_FALSE(point->isEqual(rt::make<Point>(4, 3).get()));
  EXPECT_FALSE(point->isEqual(one.get()));
}

TEST(Object, ComparesWithNull) {
  const rt::Ref<Point> point = rt::make<Point>(3, 4);
  const rt::Ref<rt::Object> equal = rt::make<Point>(3, 4);
  const rt::Ref<Point> null;
  EXPECT_TRUE(rt::isEqual(point, equal));
  EXPECT_FALSE(rt::isEqual(point, null));
  EXPECT_FALSE(rt::isEqual(null, point));
  EXPECT_TRUE(rt::isEqual(null, rt::Ref<rt::Object>()));
  EXPECT_TRUE(rt::isEqual(point.get(), equal.get()));
  EXPECT_TRUE(rt::isEqual(static_cast<const rt::Object*>(nullptr), nullptr));
}

TEST(Object, IsItsOwnCopyByDefault) {
  const rt::Ref<Point> point = rt::make<Point>(3, 4);
  EXPECT_EQ(point->copy(), point);
  EXPECT_EQ(kConstant.copy(), &kConstant);
}

TEST(Object, IsDescribedByClassAndAddress) {
  const rt::Ref<Point> point = rt::make<Point>(3, 4);
  char expected[64];
  std::snprintf(expected, sizeof expected, "<Point: %p>", static_cast<void*>(point.get()));
  EXPECT_EQ(point->description(), std::string_view(expected));
}

class Unnamed final : public rt::Object {};

TEST(Object, HasItsSuperclassRecordIfItHasNoneOfItsOwn) {
  const Unnamed object;
  EXPECT_EQ(&object.classInfo(), &rt::classInfo<rt::Object>());
}

TEST(Object, AConstantIsNeitherCountedNorDestroyed) {
  char bytes[sizeof(Constant)];
  std::memcpy(bytes, static_cast<const void*>(&kConstant), sizeof bytes);
  {
    const rt::Ref<const Constant> ref = &kConstant;
    const rt::Ref<const rt::Object> copy = ref;
    EXPECT_EQ(std::memcmp(bytes, static_cast<const void*>(&kConstant), sizeof bytes), 0);
  }
  for (int i = 0; i < 3; ++i) kConstant.release();
  EXPECT_EQ(std::memcmp(bytes, static_cast<const void*>(&kConstant), sizeof bytes), 0);
  EXPECT_EQ(kConstant.value(), 42);
}

// Each thread adds and releases references of its own. The object is destroyed exactly once, with the last
// reference.
TEST(Object, IsCountedByManyThreads) {
  constexpr int kThreads = 4;
  constexpr int kRounds = 20'000;
  int destructions = 0;
  const Noted* object = new Noted(destructions);
  std::vector<std::jthread> threads;
  threads.reserve(kThreads);
  for (int i = 0; i < kThreads; ++i) {
    object->retain();
    threads.emplace_back([object] {
      for (int round = 0; round < kRounds; ++round) {
        object->retain();
        object->release();
      }
      object->release();
    });
  }
  object->release();
  threads.clear();
  EXPECT_EQ(destructions, 1);
}

}  // namespace
