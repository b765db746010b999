#pragma once

/// Provides the services of a bindings module, as a generator writes it, and a fixture. During a test, the
/// fixture replaces the shared registry with one that has these services.
///
/// Not for: anything but tests.

#include <gtest/gtest.h>

#include <array>
#include <cstddef>
#include <string>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/ServiceRegistry/ServiceRegistry.h"
#include "tests/support/TestReports.h"
#include "tests/support/WholeReports.h"

namespace TestServices {

/// The class of the services. An instance stores the tags that its factory was given.
class Thing : public rt::Implements<Thing, rt::Object> {
 public:
  explicit Thing(const SRLScopeTagSet& given) : tags(given) {}

  const SRLScopeTagSet tags;
};

/// A thing that contains another object.
class Nest final : public rt::Implements<Nest, Thing> {
 public:
  Nest(const SRLScopeTagSet& given, rt::Ref<rt::Object> other) : Implements(given), inner(std::move(other)) {}

  const rt::Ref<rt::Object> inner;
};

/// The exception that a factory throws.
struct Failure {};

inline int nullsMade = 0;

inline rt::Ref<rt::Object> makeThing(SRLScopeTagSet tags) {
  return rt::make<Thing>(tags);
}
inline rt::Ref<rt::Object> makeNull(SRLScopeTagSet /*tags*/) {
  ++nullsMade;
  return nullptr;
}
inline rt::Ref<rt::Object> throwFailure(SRLScopeTagSet /*tags*/) {
  throw Failure();
}

inline constexpr SRLAPIInstanceType kThingType{.names = {.protocolName = nullptr, .className = "Thing"}};

// An instance for each window (bit 1) and account (bit 0). An implementation may use fewer of these scopes.
inline constexpr SRLAPIRegistrationData scopedAPI{
    .identifier = "Scoped", .instanceType = kThingType, .scopeType = 0b11, .identifierLength = 6};
inline constexpr SRLAPIRegistrationData freshAPI{
    .identifier = "Fresh", .instanceType = kThingType, .scopeType = 0b11, .identifierLength = 5};
inline constexpr SRLAPIRegistrationData globalAPI{
    .identifier = "Global", .instanceType = kThingType, .identifierLength = 6};
inline constexpr SRLAPIRegistrationData nullAPI{
    .identifier = "Null", .instanceType = kThingType, .identifierLength = 4};
inline constexpr SRLAPIRegistrationData nestedAPI{
    .identifier = "Nested", .instanceType = kThingType, .scopeType = 0b11, .identifierLength = 6};
inline constexpr SRLAPIRegistrationData throwingAPI{
    .identifier = "Throwing", .instanceType = kThingType, .identifierLength = 8};
inline constexpr SRLAPIRegistrationData unboundAPI{
    .identifier = "Unbound", .instanceType = kThingType, .identifierLength = 7};
inline constexpr SRLAPIRegistrationData manyAPI{.identifier = "Many",
                                                .instanceType = kThingType,
                                                .scopeType = 0b11,
                                                .identifierLength = 4,
                                                .isMultibound = 1};
inline constexpr SRLAPIRegistrationData noneOfManyAPI{
    .identifier = "NoneOfMany", .instanceType = kThingType, .identifierLength = 10, .isMultibound = 1};
// APIs that no module has.
inline constexpr SRLAPIRegistrationData unknownAPI{
    .identifier = "Unknown", .instanceType = kThingType, .identifierLength = 7};
inline constexpr SRLAPIRegistrationData unknownManyAPI{
    .identifier = "UnknownMany", .instanceType = kThingType, .identifierLength = 11, .isMultibound = 1};

inline rt::Ref<rt::Object> makeNest(SRLScopeTagSet tags) {
  return rt::make<Nest>(tags, SRLRegistry::sharedInstance()->internalService(&scopedAPI, tags));
}

inline constexpr SRLImplementationRegistrationData scopedThing{.identifier = "ScopedThing",
                                                               .instanceType = {.className = "Thing"},
                                                               .factory = makeThing,
                                                               .scopeType = 0b01};
inline constexpr SRLImplementationRegistrationData freshThing{.identifier = "FreshThing",
                                                              .instanceType = {.className = "Thing"},
                                                              .factory = makeThing,
                                                              .scopeType = 0b10,
                                                              .lifetime = 1};
inline constexpr SRLImplementationRegistrationData globalThing{
    .identifier = "GlobalThing", .instanceType = {.className = "Thing"}, .factory = makeThing};
inline constexpr SRLImplementationRegistrationData nullThing{
    .identifier = "NullThing", .instanceType = {.className = "Thing"}, .factory = makeNull};
inline constexpr SRLImplementationRegistrationData nestedThing{.identifier = "NestedThing",
                                                               .instanceType = {.className = "Nest"},
                                                               .factory = makeNest,
                                                               .scopeType = 0b11};
inline constexpr SRLImplementationRegistrationData throwingThing{.identifier = "ThrowingThing",
                                                                 .instanceType = {.className = "Thing"},
                                                                 .factory = throwFailure,
                                                                 .lifetime = 1};

using Implementations = const SRLImplementationRegistrationData*;
inline constexpr Implementations kNone[] = {nullptr};
inline constexpr Implementations kScoped[] = {&scopedThing, nullptr};
inline constexpr Implementations kFresh[] = {&freshThing, nullptr};
inline constexpr Implementations kGlobal[] = {&globalThing, nullptr};
inline constexpr Implementations kNull[] = {&nullThing, nullptr};
inline constexpr Implementations kNested[] = {&nestedThing, nullptr};
inline constexpr Implementations kThrowing[] = {&throwingThing, nullptr};
inline constexpr Implementations kMany[] = {&scopedThing, &nullThing, &freshThing, nullptr};

inline constexpr _SRLBindingRegistrationData kBindings[] = {
    {&manyAPI, kMany},     {&nullAPI, kNull},         {&freshAPI, kFresh},
    {&globalAPI, kGlobal}, {&nestedAPI, kNested},     {&scopedAPI, kScoped},
    {&unboundAPI, kNone},  {&throwingAPI, kThrowing}, {&noneOfManyAPI, kNone},
};
static_assert(SRLAreBindingsSorted(kBindings));
inline constexpr SRLBindingsModuleData kModule{.bindingsBegin = std::begin(kBindings),
                                               .bindingsEnd = std::end(kBindings)};

/// Returns a set of these tags. The caller must keep the tags alive.
inline SRLScopeTagSet tagSet(const rt::Ref<rt::Object>& first = nullptr,
                             const rt::Ref<rt::Object>& second = nullptr) {
  return {{first.get(), second.get()}};
}

/// Replaces the shared registry with one that has the module's services.
class ServicesTest : public testing::Test {
 protected:
  ServicesTest() : before_(SRLRegistry::setSharedInstance(registry)) {
    nullsMade = 0;
    registry->internalRegisterBindings(std::array{&kModule});
  }
  ~ServicesTest() override { SRLRegistry::setSharedInstance(before_); }

  /// Returns the texts that were reported since the last call. Expects each to be a fault of this operation
  /// of the registry, with the text of the format and its parameters in order.
  std::vector<std::string> reportsOf(const std::string& function) {
    std::vector<std::string> texts;
    for (const rt::Ref<LUMLogMessage>& message : reports.messages()) {
      const WholeReport report = wholeReport(*message);
      EXPECT_EQ(report.level, LUMLogLevelFault);
      EXPECT_EQ(report.file, "Shared/ServiceRegistry/Source/SRLRegistry");
      EXPECT_EQ(report.function, function);
      EXPECT_TRUE(report.hasLine);
      std::string filled(message->format().view());
      std::size_t at = 0;
      for (const std::string& parameter : report.parameters) {
        at = filled.find("%@", at);
        if (at == std::string::npos) break;
        filled.replace(at, 2, parameter);
        at += parameter.size();
      }
      EXPECT_EQ(filled, report.text) << report.parameters.size() << " parameters";
      EXPECT_NE(at, std::string::npos) << "too many parameters";
      texts.push_back(report.text);
    }
    return texts;
  }

  TestReports reports;
  const rt::Ref<SRLRegistry> registry = SRLRegistry::initPrivate();
  const rt::Ref<rt::Object> account = rt::String::fromUTF8("account").object();
  const rt::Ref<rt::Object> window = rt::String::fromUTF8("window").object();
  const SRLScopeTagSet tags = tagSet(account, window);

 private:
  const rt::Ref<SRLRegistry> before_;
};

}  // namespace TestServices
