#pragma once

/// What generated code says of services: a record for each API, for each implementation, and for each binding
/// of an API to its implementations.
///
///     rt::Ref<rt::Object> makeClock(SRLScopeTagSet) { return rt::make<SystemClock>(); }
///
///     constexpr SRLAPIRegistrationData clockAPI{
///         .identifier = "Clock",
///         .instanceType = {.names = {.protocolName = "Clock"}},
///         .identifierLength = 5,
///     };
///     constexpr SRLImplementationRegistrationData systemClock{
///         .identifier = "SystemClock",
///         .instanceType = {.className = "SystemClock"},
///         .factory = makeClock,
///     };
///     constexpr const SRLImplementationRegistrationData* clocks[] = {&systemClock, nullptr};
///     constexpr _SRLBindingRegistrationData bindings[] = {{&clockAPI, clocks}};
///     static_assert(SRLAreBindingsSorted(bindings));              // SRLBindingsModuleData.h
///
/// The records are constants of a fixed layout, with texts of UTF-8 that end with NUL, and live as long as
/// the process: the registry keeps pointers to them. Any thread may read them.
///
/// The registry knows an API and an implementation by the address of the record, not by the identifier. A
/// copy of an API's record is another API, to which nothing is bound. So define each record once; in a
/// header, as `inline constexpr`.
///
/// Not for: people; what they write is turned into these.

// The records are one binary format, so they are in one header. Their bits are plain bit-fields, so that
// generated code can name what it sets. The offsets are checked while compiling. No compiler tells where the
// bits are in their bytes, so a test looks.

#include <cstddef>
#include <cstdint>

#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLInstanceType.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSet.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeType.h"

// NOLINTBEGIN(bugprone-reserved-identifier,cert-dcl37-c,cert-dcl51-cpp): names that generated code uses

/// How a record gives the type of what it is about: which arm of the union.
enum SRLInstanceTypeKind : std::uint8_t {
  /// By name: of a class and, for APIs, a protocol.
  SRLInstanceTypeKindNames = 0,
  /// By a function that makes the instance type.
  SRLInstanceTypeKindFunction = 1,
  /// Not at all; for instances of implementations only.
  SRLInstanceTypeKindNone = 2,
};

/// The type of an API's instances.
union SRLAPIInstanceType {
  /// Either may be null.
  struct Names {
    const char* protocolName = nullptr;
    const char* className = nullptr;
  };

  Names names{};
  /// Not null. Takes the record; returns a new instance type.
  rt::Ref<SRLInstanceType> (*function)(const struct _SRLAPIRegistrationData* record);
};

/// A service interface.
struct _SRLAPIRegistrationData {
  /// What the registry finds the API by.
  const char* identifier = nullptr;
  SRLAPIInstanceType instanceType{};
  /// The scope that must be given with a request.
  SRLScopeType scopeType = 0;
  /// In bytes, without the NUL.
  std::uint16_t identifierLength = 0;
  /// An SRLInstanceTypeKind.
  std::uint16_t instanceTypeKind : 2 = SRLInstanceTypeKindNames;
  /// Whether any number of implementations may be bound, and not just one.
  std::uint16_t isMultibound : 1 = 0;
  std::uint16_t reserved : 13 = 0;
};
using SRLAPIRegistrationData = _SRLAPIRegistrationData;

/// The type of an implementation's instances, or of their configuration.
union SRLImplementationInstanceType {
  const char* className = nullptr;
  /// Not null. Takes the record; returns a new instance type.
  rt::Ref<SRLInstanceType> (*function)(const struct _SRLImplementationRegistrationData* record);
};

/// Something that implements an API.
struct _SRLImplementationRegistrationData {
  const char* identifier = nullptr;
  SRLImplementationInstanceType instanceType{};
  SRLImplementationInstanceType configInstanceType{};
  /// Makes an instance for the scope with these tags. Returns null where there is none.
  rt::Ref<rt::Object> (*factory)(SRLScopeTagSet tags) = nullptr;
  /// The scope in which an instance lives.
  SRLScopeType scopeType = 0;
  /// An SRLInstanceTypeKind; 3 counts as SRLInstanceTypeKindNames.
  std::uint32_t instanceTypeKind : 2 = SRLInstanceTypeKindNames;
  /// SRLInstanceTypeKindNames or SRLInstanceTypeKindFunction.
  std::uint32_t configInstanceTypeKind : 2 = SRLInstanceTypeKindNames;
  /// 0 for one instance in a scope, 1 for a new one at every request.
  std::uint32_t lifetime : 1 = 0;
  /// Whether the implementation takes a configuration, and whether it needs one.
  std::uint32_t hasConfiguration : 1 = 0;
  std::uint32_t isConfigurationRequired : 1 = 0;
  std::uint32_t reserved : 25 = 0;
};
using SRLImplementationRegistrationData = _SRLImplementationRegistrationData;

/// That implementations are bound to an API.
struct _SRLBindingRegistrationData {
  const SRLAPIRegistrationData* api = nullptr;
  /// Ends with null. With nothing before it, the API is known, and nothing is bound to it here.
  const SRLImplementationRegistrationData* const* implementations = nullptr;
};

// NOLINTEND(bugprone-reserved-identifier,cert-dcl37-c,cert-dcl51-cpp)

// The layout is part of the interface. Where the bits are in their bytes a test looks at.
static_assert(sizeof(void*) == 8);

static_assert(sizeof(SRLAPIInstanceType) == 16);
static_assert(offsetof(SRLAPIInstanceType::Names, protocolName) == 0);
static_assert(offsetof(SRLAPIInstanceType::Names, className) == 8);
static_assert(sizeof(SRLAPIRegistrationData) == 32);
static_assert(offsetof(SRLAPIRegistrationData, identifier) == 0);
static_assert(offsetof(SRLAPIRegistrationData, instanceType) == 8);
static_assert(offsetof(SRLAPIRegistrationData, scopeType) == 24);
static_assert(offsetof(SRLAPIRegistrationData, identifierLength) == 28);

static_assert(sizeof(SRLImplementationInstanceType) == 8);
static_assert(sizeof(SRLImplementationRegistrationData) == 40);
static_assert(offsetof(SRLImplementationRegistrationData, identifier) == 0);
static_assert(offsetof(SRLImplementationRegistrationData, instanceType) == 8);
static_assert(offsetof(SRLImplementationRegistrationData, configInstanceType) == 16);
static_assert(offsetof(SRLImplementationRegistrationData, factory) == 24);
static_assert(offsetof(SRLImplementationRegistrationData, scopeType) == 32);

static_assert(sizeof(_SRLBindingRegistrationData) == 16);
static_assert(offsetof(_SRLBindingRegistrationData, api) == 0);
static_assert(offsetof(_SRLBindingRegistrationData, implementations) == 8);

/// The type of an API's instances, as a new object. What the record's names stand for is given to
/// SRLMakeInstanceTypeContainer, a name that is not known as none. A kind other than
/// SRLInstanceTypeKindNames and SRLInstanceTypeKindFunction is reported, and ends the program. Throws what
/// the record's function and the error callback throw, and std::bad_alloc.
rt::Ref<SRLInstanceType> SRLAPIRegistrationDataInstanceType(const SRLAPIRegistrationData* record);

/// The type of an implementation's instances, as a new object; null where the record gives none. A class that
/// is not known is reported, and yields null. Throws like the function above.
rt::Ref<SRLInstanceType> SRLImplementationRegistrationDataInstanceType(
    const SRLImplementationRegistrationData* record);

/// The type of an implementation's configuration, as a new object; null where it takes none. A class that is
/// not known is reported, and yields null. A kind other than SRLInstanceTypeKindNames and
/// SRLInstanceTypeKindFunction is reported, and ends the program. Throws like the functions above.
rt::Ref<SRLInstanceType> SRLImplementationRegistrationDataConfigInstanceType(
    const SRLImplementationRegistrationData* record);
