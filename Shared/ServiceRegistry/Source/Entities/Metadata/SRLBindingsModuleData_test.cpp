#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLBindingsModuleData.h"

#include <gtest/gtest.h>

#include <array>
#include <bit>
#include <cstdint>
#include <cstring>
#include <iterator>
#include <type_traits>

namespace {

constexpr SRLAPIRegistrationData api(const char* identifier, std::uint16_t length) {
  return {.identifier = identifier, .identifierLength = length};
}
constexpr SRLAPIRegistrationData none = api("", 0);
constexpr SRLAPIRegistrationData b = api("b", 1);
constexpr SRLAPIRegistrationData high = api("\xC3", 1);
constexpr SRLAPIRegistrationData aa = api("aa", 2);
constexpr SRLAPIRegistrationData ab = api("ab", 2);
constexpr SRLAPIRegistrationData anotherAb = api("ab", 2);
constexpr SRLAPIRegistrationData ba = api("ba", 2);
constexpr SRLAPIRegistrationData tooLong = api("abc", 4);
constexpr SRLAPIRegistrationData tooShort = api("abc", 2);

constexpr const SRLImplementationRegistrationData* nothing[] = {nullptr};

template <class... APIs>
constexpr bool areSorted(const APIs&... apis) {
  const std::array<_SRLBindingRegistrationData, sizeof...(apis)> bindings{
      _SRLBindingRegistrationData{&apis, nothing}...};
  return SRLAreBindingsSorted(bindings);
}

static_assert(SRLAreBindingsSorted({}));
static_assert(areSorted(aa));
static_assert(areSorted(none, b, high, aa, ab, ba));
// A shorter identifier comes first, whatever its bytes.
static_assert(areSorted(b, aa));
static_assert(!areSorted(aa, b));
// Bytes are compared as unsigned numbers.
static_assert(areSorted(b, high));
static_assert(!areSorted(high, b));
static_assert(!areSorted(ab, aa));
static_assert(!areSorted(aa, ba, ab));
static_assert(!areSorted(b, none));
// Each identifier may occur once.
static_assert(!areSorted(ab, ab));
static_assert(!areSorted(ab, anotherAb));
// Each `identifierLength` must be right.
static_assert(!areSorted(tooLong));
static_assert(!areSorted(tooShort));
static_assert(!areSorted(b, tooShort));

static_assert(SRLIsIdentifierBefore("", "a"));
static_assert(SRLIsIdentifierBefore("b", "aa"));
static_assert(!SRLIsIdentifierBefore("aa", "b"));
static_assert(SRLIsIdentifierBefore("aa", "ab"));
static_assert(SRLIsIdentifierBefore("a", "\x80"));
static_assert(!SRLIsIdentifierBefore("a", "a"));

// A module can be a constant, for which no code runs at start-up or at exit.
static_assert(std::is_standard_layout_v<SRLBindingsModuleData> &&
              std::is_trivially_copyable_v<SRLBindingsModuleData>);

constexpr _SRLBindingRegistrationData bindings[] = {{&b, nothing}, {&aa, nothing}};
static_assert(SRLAreBindingsSorted(bindings));

void addConfigurationFactories(SRLConfigurationFactories&) {}

constinit const SRLBindingsModuleData module{
    .bindingsBegin = std::begin(bindings),
    .bindingsEnd = std::end(bindings),
    .addConfigurationFactories = addConfigurationFactories,
    .generatorFlag = 0x12,
    .allowsMultipleModules = 0x34,
};

std::uint64_t valueAt(const std::array<std::uint8_t, 32>& bytes, std::size_t offset) {
  std::uint64_t value = 0;
  for (std::size_t i = 8; i > 0; --i) value = value << 8 | bytes.at(offset + i - 1);
  return value;
}

TEST(SRLBindingsModuleData, PlacesItsFields) {
  ASSERT_EQ(sizeof(SRLBindingsModuleData), 32U);
  std::array<std::uint8_t, 32> bytes{};
  // Not by std::bit_cast, which need not keep the bytes between the fields.
  std::memcpy(bytes.data(), &module, sizeof module);
  EXPECT_EQ(valueAt(bytes, 0), reinterpret_cast<std::uintptr_t>(&bindings[0]));
  EXPECT_EQ(valueAt(bytes, 8), reinterpret_cast<std::uintptr_t>(&bindings[0]) + 2UL * 16);
  EXPECT_EQ(valueAt(bytes, 16), reinterpret_cast<std::uintptr_t>(&addConfigurationFactories));
  EXPECT_EQ(bytes[24], 0x12U);
  EXPECT_EQ(bytes[25], 0x34U);
}

// The bytes are as another generator writes them.
TEST(SRLBindingsModuleData, CanBeReadFromBytes) {
  alignas(8) std::array<std::uint8_t, 32> bytes{};
  const auto write = [&bytes](std::size_t offset, std::uint64_t value) {
    for (std::size_t i = 0; i < 8; ++i) bytes.at(offset + i) = static_cast<std::uint8_t>(value >> (8 * i));
  };
  write(0, reinterpret_cast<std::uintptr_t>(&bindings[0]));
  write(8, reinterpret_cast<std::uintptr_t>(&bindings[1]));
  write(16, reinterpret_cast<std::uintptr_t>(&addConfigurationFactories));
  bytes[25] = 0xFF;
  const auto read = std::bit_cast<SRLBindingsModuleData>(bytes);
  ASSERT_EQ(read.bindings().size(), 1U);
  EXPECT_EQ(read.bindings().front().api, &b);
  EXPECT_EQ(read.addConfigurationFactories, addConfigurationFactories);
  EXPECT_EQ(read.generatorFlag, 0U);
  EXPECT_EQ(read.allowsMultipleModules, 0xFFU);
}

TEST(SRLBindingsModuleData, IsEmptyByDefault) {
  EXPECT_TRUE(SRLBindingsModuleData().bindings().empty());
  EXPECT_EQ(SRLBindingsModuleData().addConfigurationFactories, nullptr);
  EXPECT_EQ(module.bindings().size(), 2U);
}

}  // namespace
