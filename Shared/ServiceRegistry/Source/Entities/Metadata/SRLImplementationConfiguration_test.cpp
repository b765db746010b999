#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLImplementationConfiguration.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <limits>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLClassType.h"
#include "tests/support/TestReports.h"

namespace {

using namespace rt::literals;
using rt::Ref;

class Options final : public rt::Implements<Options, rt::Object> {};

// An instance type of generated code, with a given hash.
class HashedType final : public rt::Implements<HashedType, rt::Object, SRLInstanceType> {
 public:
  explicit HashedType(std::uint64_t hash) : hash_(hash) {}
  bool doesRepresentSupertypeOfClass(const rt::ClassInfo&) const override { return true; }
  bool isEqual(const rt::Object* other) const override {
    const auto* type = rt::cast<HashedType>(other);
    return type != nullptr && type->hash_ == hash_;
  }
  std::uint64_t hash() const override { return hash_; }
  rt::String description() const override { return "Hashed"_s; }

 private:
  const std::uint64_t hash_;
};

Ref<SRLImplementationConfiguration> configuration(std::uint64_t hash, bool required) {
  return SRLImplementationConfiguration::initWithConfigurationInstanceType(rt::make<HashedType>(hash),
                                                                           required);
}

TEST(SRLImplementationConfiguration, ReturnsWhatItWasMadeWith) {
  const Ref<SRLInstanceType> type = SRLClassType::initWithClass(&rt::classInfo<Options>());
  for (const bool required : {false, true}) {
    const auto made = SRLImplementationConfiguration::initWithConfigurationInstanceType(type, required);
    EXPECT_EQ(made->instanceType(), type);
    EXPECT_EQ(made->isRequired(), required);
    EXPECT_EQ(rt::copy(made), made);
  }
}

TEST(SRLImplementationConfiguration, DescribesItself) {
  const auto type = SRLClassType::initWithClass(&rt::classInfo<Options>());
  EXPECT_EQ(SRLImplementationConfiguration::initWithConfigurationInstanceType(type, true)->description(),
            "SRLImplementationConfiguration<instanceType: Options, required: 1>");
  EXPECT_EQ(configuration(1, false)->description(),
            "SRLImplementationConfiguration<instanceType: Hashed, required: 0>");
}

TEST(SRLImplementationConfiguration, HashesBothFields) {
  EXPECT_EQ(configuration(0, false)->hash(), 0U);
  EXPECT_EQ(configuration(0, true)->hash(), 1U);
  EXPECT_EQ(configuration(7, false)->hash(), 287U);
  EXPECT_EQ(configuration(7, true)->hash(), 288U);
  // 41 * (2^64 - 1) + 1 = 41 * 2^64 - 40
  EXPECT_EQ(configuration(std::numeric_limits<std::uint64_t>::max(), true)->hash(), 18446744073709551576U);
}

TEST(SRLImplementationConfiguration, ComparesBothFields) {
  const auto given = configuration(7, true);
  EXPECT_TRUE(rt::isEqual(given, given));
  EXPECT_TRUE(rt::isEqual(given, configuration(7, true)));
  EXPECT_FALSE(rt::isEqual(given, configuration(7, false)));
  EXPECT_FALSE(rt::isEqual(given, configuration(8, true)));
  EXPECT_FALSE(rt::isEqual(given, given->instanceType()));
  EXPECT_FALSE(given->isEqual(nullptr));
}

TEST(SRLImplementationConfiguration, ReportsAMissingTypeAndYieldsNull) {
  TestReports reports;
  EXPECT_EQ(SRLImplementationConfiguration::initWithConfigurationInstanceType(nullptr, true), nullptr);
  const std::vector<Ref<LUMLogMessage>> messages = reports.messages();
  ASSERT_EQ(messages.size(), 1U);
  EXPECT_EQ(messages[0]->level(), LUMLogLevelFault);
  EXPECT_EQ(text(*messages[0]), "SRLImplementationConfiguration requires a non-nil instanceType.");
  EXPECT_EQ(messages[0]->file(),
            "Shared/ServiceRegistry/Source/Entities/Metadata/SRLImplementationConfiguration");
  EXPECT_EQ(messages[0]->function(),
            "-[SRLImplementationConfiguration initWithConfigurationInstanceType:required:]");
  EXPECT_FALSE(messages[0]->safeParameters());
}

}  // namespace
