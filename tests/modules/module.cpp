// A bindings module called NAME. No symbol outside this file refers to it. It binds an API of that name to a
// class of that name. When the registry asks it for its configurations, it requests its service, which is too
// early.
#include "Runtime/Objects/ClassMethod.h"
#include "Shared/ServiceRegistry/ServiceRegistry.h"
#include "Trace.h"

#define TEXT(x) #x
#define TEXT_OF(x) TEXT(x)

class [[gnu::visibility("default")]] NAME final : public rt::Implements<NAME, rt::Object> {
 public:
  ~NAME() override;
};
NAME::~NAME() = default;

namespace {

constexpr const char* kName = TEXT_OF(NAME);

rt::Ref<rt::Object> make(SRLScopeTagSet) {
  return rt::make<NAME>();
}

constexpr SRLAPIRegistrationData api{.identifier = kName,
                                     .instanceType = {.names = {.className = kName}},
                                     .identifierLength = sizeof TEXT_OF(NAME) - 1};
constexpr SRLImplementationRegistrationData implementation{
    .identifier = kName, .instanceType = {.className = kName}, .factory = make, .lifetime = 1};
constexpr const SRLImplementationRegistrationData* implementations[] = {&implementation, nullptr};
constexpr _SRLBindingRegistrationData bindings[] = {{&api, implementations}};
static_assert(SRLAreBindingsSorted(bindings));

void configure(SRLConfigurationFactories&) {
  trace("configures ", kName);
  if (SRLRegistry::sharedInstance()->internalService(&api, {})) trace("too early, and found: ", kName);
}

constexpr SRLBindingsModuleData data{.bindingsBegin = std::begin(bindings),
                                     .bindingsEnd = std::end(bindings),
                                     .addConfigurationFactories = configure};

const SRLBindingsModuleData* module() {
  trace("is asked: ", kName);
  return &data;
}

}  // namespace

template struct rt::AddedClassMethod<SRLRegistry, "srl_bindings" TEXT_OF(NAME), &module>;

#ifdef OPENED
extern "C" [[gnu::visibility("default")]] const SRLAPIRegistrationData* apiOfOpened() {
  return &api;
}
#endif
