// Modules whose bindings are not sorted, or have a wrong length. Each macro selects one mistake.
#include <iterator>

#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLBindingsModuleData.h"

constexpr SRLAPIRegistrationData clockAPI{.identifier = "Clock", .identifierLength = 5};
constexpr SRLAPIRegistrationData alarmAPI{.identifier = "Alarm", .identifierLength = 5};
constexpr SRLAPIRegistrationData weatherAPI{.identifier = "Weather", .identifierLength = 7};
[[maybe_unused]] constexpr SRLAPIRegistrationData cutAPI{.identifier = "Thermometer", .identifierLength = 10};
constexpr const SRLImplementationRegistrationData* nothing[] = {nullptr};

constexpr _SRLBindingRegistrationData right[] = {
    {&alarmAPI, nothing}, {&clockAPI, nothing}, {&weatherAPI, nothing}};
static_assert(SRLAreBindingsSorted(right), "right");

#ifdef BYTES
constexpr _SRLBindingRegistrationData wrong[] = {{&clockAPI, nothing}, {&alarmAPI, nothing}};
static_assert(SRLAreBindingsSorted(wrong), "the module is sorted");
#endif
#ifdef LENGTHS
constexpr _SRLBindingRegistrationData wrong[] = {{&weatherAPI, nothing}, {&clockAPI, nothing}};
static_assert(SRLAreBindingsSorted(wrong), "the module is sorted");
#endif
#ifdef TWICE
constexpr _SRLBindingRegistrationData wrong[] = {{&clockAPI, nothing}, {&clockAPI, nothing}};
static_assert(SRLAreBindingsSorted(wrong), "the module is sorted");
#endif
#ifdef CUT
constexpr _SRLBindingRegistrationData wrong[] = {{&cutAPI, nothing}};
static_assert(SRLAreBindingsSorted(wrong), "the module is sorted");
#endif
