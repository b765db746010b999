#pragma once

/// The records by which generated code describes services. There is one for each API, one for each
/// implementation, and one for each binding of an API to its implementations.
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
/// The records are constants with a fixed layout. Their texts are UTF-8 and end with NUL. The registry keeps
/// pointers to the records, so they must live as long as the process. Any thread may read them.
///
/// A record's address identifies the API or the implementation. Its identifier does not. A copy of an API's
/// record is another API, and nothing is bound to it. Define each record once; in a header, make it `inline
/// constexpr`.
///
/// Not for: handwritten code. A generator writes these records.

// The records are one binary format, so they are in one header. Their bits are plain bit-fields, so that
// generated code can name what it sets. The offsets are checked while compiling. The positions of the bits
// cannot be, so a test checks them.

#include <cstddef>
#include <cstdint>

#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLInstanceType.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSet.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeType.h"

// NOLINTBEGIN(bugprone-reserved-identifier): names that generated code uses

/// How a record describes a type. The kind selects the member of the record's union.
enum SRLInstanceTypeKind : std::uint8_t {
  /// By the name of a class or, for APIs, of a class, a protocol or both.
  SRLInstanceTypeKindNames = 0,
  /// By a function that makes the instance type.
  SRLInstanceTypeKindFunction = 1,
  /// Not at all. Valid only for the instances of an implementation.
  SRLInstanceTypeKindNone = 2,
};

/// Describes the type of an API's instances.
union SRLAPIInstanceType {
  /// Either may be null.
  struct Names {
    const char* protocolName = nullptr;
    const char* className = nullptr;
  };

  Names names{};
  /// Not null. Takes the record and returns a new instance type.
  rt::Ref<SRLInstanceType> (*function)(const struct _SRLAPIRegistrationData* record);
};

/// Describes a service interface (an API).
struct _SRLAPIRegistrationData {
  /// The text by which the registry finds the API's bindings in the modules.
  const char* identifier = nullptr;
  SRLAPIInstanceType instanceType{};
  /// The scope type. A request for the API gives one tag for each of its bits.
  SRLScopeType scopeType = 0;
  /// The length of `identifier` in bytes, without the NUL.
  std::uint16_t identifierLength = 0;
  /// SRLInstanceTypeKindNames or SRLInstanceTypeKindFunction.
  std::uint16_t instanceTypeKind : 2 = SRLInstanceTypeKindNames;
  /// 1 for a multi-bound API, which may have any number of implementations. 0 for a single-bound API, which
  /// has at most one.
  std::uint16_t isMultibound : 1 = 0;
  std::uint16_t reserved : 13 = 0;
};
using SRLAPIRegistrationData = _SRLAPIRegistrationData;

/// Describes the type of an implementation's instances, or of its configuration object.
union SRLImplementationInstanceType {
  const char* className = nullptr;
  /// Not null. Takes the record and returns a new instance type.
  rt::Ref<SRLInstanceType> (*function)(const struct _SRLImplementationRegistrationData* record);
};

/// Describes an implementation of an API.
struct _SRLImplementationRegistrationData {
  const char* identifier = nullptr;
  SRLImplementationInstanceType instanceType{};
  SRLImplementationInstanceType configInstanceType{};
  /// Returns a new instance for the scope with these tags, or null if there is no instance for it.
  rt::Ref<rt::Object> (*factory)(SRLScopeTagSet tags) = nullptr;
  /// The type of the scopes in which instances live. Its bits are a subset of those of the API.
  SRLScopeType scopeType = 0;
  /// An SRLInstanceTypeKind. The value 3 counts as SRLInstanceTypeKindNames.
  std::uint32_t instanceTypeKind : 2 = SRLInstanceTypeKindNames;
  /// SRLInstanceTypeKindNames or SRLInstanceTypeKindFunction.
  std::uint32_t configInstanceTypeKind : 2 = SRLInstanceTypeKindNames;
  /// 0 for one instance per scope, 1 for a new instance at every request.
  std::uint32_t lifetime : 1 = 0;
  /// 1 if the implementation takes a configuration object.
  std::uint32_t hasConfiguration : 1 = 0;
  /// 1 if the implementation needs the configuration object.
  std::uint32_t isConfigurationRequired : 1 = 0;
  std::uint32_t reserved : 25 = 0;
};
using SRLImplementationRegistrationData = _SRLImplementationRegistrationData;

/// Binds implementations to an API.
struct _SRLBindingRegistrationData {
  const SRLAPIRegistrationData* api = nullptr;
  /// A list that ends with null. An empty list declares the API and binds nothing to it.
  const SRLImplementationRegistrationData* const* implementations = nullptr;
};

// NOLINTEND(bugprone-reserved-identifier)

// Generated code relies on this layout.
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

/// Returns the type of an API's instances as a new object. If the record gives names, this looks up the class
/// and the protocol and calls SRLMakeInstanceTypeContainer with them. A name that is not found counts as
/// null.
/// Errors: a kind other than SRLInstanceTypeKindNames and SRLInstanceTypeKindFunction is reported and ends
/// the program. Throws what the record's function and the error callback throw, and std::bad_alloc.
rt::Ref<SRLInstanceType> SRLAPIRegistrationDataInstanceType(const SRLAPIRegistrationData* record);

/// Returns the type of an implementation's instances as a new object. Null if the record gives no type.
/// Errors: a class name that is not found is reported and yields null. Throws like the function above.
rt::Ref<SRLInstanceType> SRLImplementationRegistrationDataInstanceType(
    const SRLImplementationRegistrationData* record);

/// Returns the type of an implementation's configuration object as a new object. Null if it takes none.
/// Errors: a class name that is not found is reported and yields null. A kind other than
/// SRLInstanceTypeKindNames and SRLInstanceTypeKindFunction is reported and ends the program. Throws like the
/// functions above.
rt::Ref<SRLInstanceType> SRLImplementationRegistrationDataConfigInstanceType(
    const SRLImplementationRegistrationData* record);
