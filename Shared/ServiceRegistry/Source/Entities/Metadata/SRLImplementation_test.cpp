#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLImplementation.h"

#include <gtest/gtest.h>

#include <array>
#include <cstdint>
#include <cstdio>
#include <functional>
#include <limits>
#include <string>
#include <string_view>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/String.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLClassType.h"
#include "Shared/ServiceRegistry/Source/Private/SRLScopedFactory.h"

namespace {

using namespace rt::literals;
using rt::Ref;

class Clock final : public rt::Implements<Clock, rt::Object> {};

// An instance type with a given hash, equal to types with the same hash. It counts its comparisons.
class TestType final : public rt::Implements<TestType, rt::Object, SRLInstanceType> {
 public:
  TestType(std::uint64_t hash, int* comparisons) : hash_(hash), comparisons_(comparisons) {}
  bool doesRepresentSupertypeOfClass(const rt::ClassInfo&) const override { return true; }
  bool isEqual(const rt::Object* other) const override {
    if (comparisons_ != nullptr) ++*comparisons_;
    const auto* type = rt::cast<TestType>(other);
    return type != nullptr && type->hash_ == hash_;
  }
  std::uint64_t hash() const override { return hash_; }
  rt::String description() const override { return "Test"_s; }

 private:
  const std::uint64_t hash_;
  int* const comparisons_;
};

Ref<SRLInstanceType> type(std::uint64_t hash, int* comparisons = nullptr) {
  return rt::make<TestType>(hash, comparisons);
}

Ref<SRLImplementationConfiguration> configuration(std::uint64_t hash, bool required,
                                                  int* comparisons = nullptr) {
  return SRLImplementationConfiguration::initWithConfigurationInstanceType(type(hash, comparisons), required);
}

// The parts of an implementation. A test can change each of them.
struct Parts {
  std::string_view identifier = "SystemClock";
  Ref<SRLInstanceType> instanceType = type(7);
  std::uint64_t lifetime = 1;
  SRLScopeType scope = 0b101;
  SRLFactoryBlock factoryBlock = [](SRLScopeTagSet, bool*) -> Ref<rt::Object> { return rt::make<Clock>(); };
  Ref<SRLImplementationConfiguration> configuration = ::configuration(9, true);

  Ref<SRLImplementation> make() const {
    return SRLImplementation::initWithIdentifier(identifier, instanceType, lifetime, scope, factoryBlock,
                                                 configuration);
  }
};

std::string addressOf(const void* object) {
  std::array<char, 32> text{};
  std::snprintf(text.data(), text.size(), "%p", object);
  return text.data();
}

std::string descriptionOf(const Ref<SRLImplementation>& implementation) {
  return std::string(implementation->description().view());
}

TEST(SRLImplementation, ReturnsWhatItWasMadeWith) {
  const Parts parts;
  const Ref<SRLImplementation> made = parts.make();
  EXPECT_EQ(made->instanceType(), parts.instanceType);
  EXPECT_EQ(made->lifetime(), 1U);
  EXPECT_EQ(made->scopeType(), 0b101U);
  EXPECT_EQ(made->factoryBlock(), parts.factoryBlock);
  EXPECT_EQ(made->configuration(), parts.configuration);
  EXPECT_EQ(rt::copy(made), made);
}

TEST(SRLImplementation, ReturnsTheLargestLifetimeAndScope) {
  Parts parts;
  parts.lifetime = std::numeric_limits<std::uint64_t>::max();
  parts.scope = std::numeric_limits<SRLScopeType>::max();
  EXPECT_EQ(parts.make()->lifetime(), 18446744073709551615U);
  EXPECT_EQ(parts.make()->scopeType(), 4294967295U);
}

TEST(SRLImplementation, AcceptsNullForTypeConfigurationAndFactory) {
  Parts parts;
  parts.instanceType = nullptr;
  parts.configuration = nullptr;
  parts.factoryBlock = nullptr;
  const Ref<SRLImplementation> made = parts.make();
  EXPECT_EQ(made->instanceType(), nullptr);
  EXPECT_EQ(made->configuration(), nullptr);
  EXPECT_EQ(made->factoryBlock(), nullptr);
}

TEST(SRLImplementation, FindsTheScopedFactoryInItsBlock) {
  static constexpr SRLImplementationRegistrationData kRecord;
  Parts parts;
  EXPECT_EQ(parts.make()->scopedFactory(), nullptr);
  parts.factoryBlock = SRLScopedFactory{nullptr, &kRecord, 0b111, 0b101, 1};
  const Ref<SRLImplementation> made = parts.make();
  ASSERT_NE(made->scopedFactory(), nullptr);
  EXPECT_EQ(made->scopedFactory()->identifier, &kRecord);
  EXPECT_EQ(made->scopedFactory()->apiScope, 0b111U);
  parts.factoryBlock = nullptr;
  EXPECT_EQ(parts.make()->scopedFactory(), nullptr);
}

TEST(SRLImplementation, PassesTagsAndFlagToItsFactory) {
  const Ref<Clock> tag = rt::make<Clock>();
  const Ref<Clock> clock = rt::make<Clock>();
  SRLScopeTagSet given;
  given.tags[0] = tag.get();
  Parts parts;
  parts.factoryBlock = [&](const SRLScopeTagSet& tags, bool* instanceCreated) -> Ref<rt::Object> {
    EXPECT_EQ(tags.tags, given.tags);
    *instanceCreated = true;
    return clock;
  };
  bool isCreated = false;
  EXPECT_EQ(parts.make()->factoryBlock()(given, &isCreated), clock);
  EXPECT_TRUE(isCreated);
}

TEST(SRLImplementation, DescribesItself) {
  Parts parts;
  parts.instanceType = SRLClassType::initWithClass(&rt::classInfo<Clock>());
  const Ref<SRLImplementation> made = parts.make();
  EXPECT_EQ(descriptionOf(made),
            "SRLImplementation<" + addressOf(made.get()) +
                ", identifier: SystemClock, instanceType: Clock, lifetime: 1, scopeType: 5, configuration: "
                "SRLImplementationConfiguration<instanceType: Test, required: 1>>");
}

TEST(SRLImplementation, DescribesItselfWithoutTypeAndConfiguration) {
  Parts parts;
  parts.instanceType = nullptr;
  parts.configuration = nullptr;
  parts.lifetime = std::numeric_limits<std::uint64_t>::max();
  parts.scope = std::numeric_limits<SRLScopeType>::max();
  const Ref<SRLImplementation> made = parts.make();
  EXPECT_EQ(descriptionOf(made), "SRLImplementation<" + addressOf(made.get()) +
                                     ", identifier: SystemClock, instanceType: (null), lifetime: "
                                     "18446744073709551615, scopeType: 4294967295, configuration: None>");
}

// The bytes after the identifier do not matter.
TEST(SRLImplementation, AcceptsAnIdentifierWithoutATerminatingNUL) {
  const std::string text = "SystemClock";
  const std::vector<char> exact(text.begin(), text.end());
  Parts parts;
  parts.identifier = {exact.data(), exact.size()};
  const Ref<SRLImplementation> made = parts.make();
  EXPECT_NE(descriptionOf(made).find(", identifier: SystemClock, instanceType: "), std::string::npos);
  EXPECT_TRUE(rt::isEqual(made, Parts().make()));
  EXPECT_EQ(made->hash(), Parts().make()->hash());

  parts.identifier = std::string_view("SystemClock's").substr(0, text.size());
  EXPECT_NE(descriptionOf(parts.make()).find(", identifier: SystemClock, instanceType: "), std::string::npos);
  EXPECT_TRUE(rt::isEqual(parts.make(), made));
  EXPECT_EQ(parts.make()->hash(), made->hash());

  parts.identifier = std::string_view("SystemClock").substr(0, 0);
  EXPECT_NE(descriptionOf(parts.make()).find(", identifier: , instanceType: "), std::string::npos);
}

TEST(SRLImplementation, DoesNotCopyItsIdentifier) {
  std::string text = "SystemClock";
  Parts parts;
  parts.identifier = text;
  const Ref<SRLImplementation> made = parts.make();
  text = "QuartzClock";
  EXPECT_NE(descriptionOf(made).find("QuartzClock"), std::string::npos);
}

std::uint64_t hashOfText(std::string_view text) {
  return std::hash<std::string_view>()(text);
}

TEST(SRLImplementation, HashesAllFieldsAsWorkedOutByHand) {
  // The hash of the configuration is 41 * 9 + 1 = 370.
  ASSERT_EQ(configuration(9, true)->hash(), 370U);
  // 41 * (41 * (41 * (41 * 7 + 1) + 5) + 370) = 41 * (41 * (41 * 288 + 5) + 370) = 41 * 484703
  EXPECT_EQ(Parts().make()->hash(), hashOfText("SystemClock") + 19872823U);

  Parts parts;
  parts.identifier = "";
  parts.instanceType = nullptr;
  parts.configuration = nullptr;
  parts.lifetime = 0;
  parts.scope = 0;
  EXPECT_EQ(parts.make()->hash(), hashOfText(""));
  parts.lifetime = 1;  // 41^3
  EXPECT_EQ(parts.make()->hash(), hashOfText("") + 68921U);
  parts.scope = 2;  // and 41^2 * 2
  EXPECT_EQ(parts.make()->hash(), hashOfText("") + 68921U + 3362U);
  parts.configuration = configuration(9, true);  // and 41 * 370
  EXPECT_EQ(parts.make()->hash(), hashOfText("") + 68921U + 3362U + 15170U);
  parts.instanceType = type(3);  // and 41^4 * 3
  EXPECT_EQ(parts.make()->hash(), hashOfText("") + 68921U + 3362U + 15170U + 8477283U);
}

TEST(SRLImplementation, WrapsItsHashAround) {
  Parts parts;
  parts.instanceType = type(std::numeric_limits<std::uint64_t>::max());
  parts.lifetime = std::numeric_limits<std::uint64_t>::max();
  parts.scope = std::numeric_limits<SRLScopeType>::max();
  parts.configuration = nullptr;
  // 2^64 - 1 counts as -1: -41^4 - 41^3 + 41^2 * (2^32 - 1) = -2825761 - 68921 + 7219840022895
  EXPECT_EQ(parts.make()->hash(), hashOfText("SystemClock") + 7219840022895U - 2894682U);
  // The type adds -41^4 = -2825761. The configuration's hash is 41 * -1 = -41, which adds 41 * -41 = -1681.
  parts.lifetime = 0;
  parts.scope = 0;
  parts.configuration = configuration(std::numeric_limits<std::uint64_t>::max(), false);
  EXPECT_EQ(parts.make()->hash(), hashOfText("SystemClock") - 2825761U - 1681U);
}

TEST(SRLImplementation, EqualsAnImplementationWithEqualParts) {
  const Ref<SRLImplementation> made = Parts().make();
  const Ref<SRLImplementation> same = Parts().make();
  ASSERT_NE(made, same);
  EXPECT_TRUE(rt::isEqual(made, made));
  EXPECT_TRUE(rt::isEqual(made, same));
  EXPECT_EQ(made->hash(), same->hash());
}

TEST(SRLImplementation, EqualsNoObjectOfAnotherClass) {
  const Ref<SRLImplementation> made = Parts().make();
  EXPECT_FALSE(made->isEqual(nullptr));
  EXPECT_FALSE(rt::isEqual(made, made->configuration()));
  EXPECT_FALSE(rt::isEqual(made, rt::make<Clock>()));
}

// How often a comparison of two implementations compares their types and their configurations.
struct Comparisons {
  int ofTypes = 0;
  int ofConfigurations = 0;
};

class SRLImplementationEquality : public testing::Test {
 protected:
  SRLImplementationEquality() {
    for (Parts* parts : {&first_, &second_}) {
      parts->instanceType = type(7, &comparisons_.ofTypes);
      parts->configuration = configuration(9, true, &comparisons_.ofConfigurations);
    }
  }

  bool areEqual() {
    comparisons_ = {};
    const bool areEqual = rt::isEqual(first_.make(), second_.make());
    EXPECT_EQ(rt::isEqual(second_.make(), first_.make()), areEqual);
    comparisons_.ofTypes /= 2;
    comparisons_.ofConfigurations /= 2;
    return areEqual;
  }

  Parts first_;
  Parts second_;
  Comparisons comparisons_;
};

TEST_F(SRLImplementationEquality, ComparesTypeAndConfigurationOnce) {
  EXPECT_TRUE(areEqual());
  EXPECT_EQ(comparisons_.ofTypes, 1);
  EXPECT_EQ(comparisons_.ofConfigurations, 1);
}

TEST_F(SRLImplementationEquality, ComparesTheIdentifierFirst) {
  for (const std::string_view other : {"SystemCloc", "SystemClock ", "QuartzClock", "systemClock", ""}) {
    second_.identifier = other;
    EXPECT_FALSE(areEqual()) << other;
    EXPECT_EQ(comparisons_.ofTypes, 0);
    EXPECT_EQ(comparisons_.ofConfigurations, 0);
  }
  // Every byte counts, including a NUL and the bytes after it.
  using namespace std::literals;
  first_.identifier = "System\0Clock"sv;
  second_.identifier = "System\0Clack"sv;
  EXPECT_FALSE(areEqual());
  second_.identifier = std::string_view("System\0Clock!", 12);
  EXPECT_TRUE(areEqual());
}

TEST_F(SRLImplementationEquality, ComparesTheInstanceTypeSecond) {
  second_.instanceType = type(8, &comparisons_.ofTypes);
  EXPECT_FALSE(areEqual());
  EXPECT_EQ(comparisons_.ofTypes, 1);
  EXPECT_EQ(comparisons_.ofConfigurations, 0);
  second_.instanceType = nullptr;
  EXPECT_FALSE(areEqual());
  first_.instanceType = nullptr;
  EXPECT_TRUE(areEqual());
}

TEST_F(SRLImplementationEquality, ComparesTheLifetimeThird) {
  second_.lifetime = 0;
  EXPECT_FALSE(areEqual());
  EXPECT_EQ(comparisons_.ofTypes, 1);
  EXPECT_EQ(comparisons_.ofConfigurations, 0);
}

TEST_F(SRLImplementationEquality, ComparesTheScopeFourth) {
  second_.scope = 0b100;
  EXPECT_FALSE(areEqual());
  EXPECT_EQ(comparisons_.ofTypes, 1);
  EXPECT_EQ(comparisons_.ofConfigurations, 0);
}

TEST_F(SRLImplementationEquality, ComparesTheConfigurationLast) {
  second_.configuration = configuration(8, true, &comparisons_.ofConfigurations);
  EXPECT_FALSE(areEqual());
  EXPECT_EQ(comparisons_.ofTypes, 1);
  EXPECT_EQ(comparisons_.ofConfigurations, 1);
  second_.configuration = configuration(9, false, &comparisons_.ofConfigurations);
  EXPECT_FALSE(areEqual());
  second_.configuration = nullptr;
  EXPECT_FALSE(areEqual());
  first_.configuration = nullptr;
  EXPECT_TRUE(areEqual());
}

TEST_F(SRLImplementationEquality, IgnoresTheFactories) {
  second_.factoryBlock = [](SRLScopeTagSet, bool*) -> Ref<rt::Object> { return nullptr; };
  ASSERT_NE(first_.factoryBlock, second_.factoryBlock);
  EXPECT_TRUE(areEqual());
  EXPECT_EQ(first_.make()->hash(), second_.make()->hash());
  second_.factoryBlock = nullptr;
  EXPECT_TRUE(areEqual());
  EXPECT_EQ(first_.make()->hash(), second_.make()->hash());
}

}  // namespace
