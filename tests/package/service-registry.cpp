// A host that is built against the installed libraries only. It prints the time of a clock that the registry
// finds.
#include <cstdio>
#include <iterator>

#include "Shared/ServiceRegistry/ServiceRegistry.h"

struct Clock : rt::Protocol<Clock> {
  virtual int now() const = 0;

 protected:
  ~Clock() = default;
};

class SystemClock final : public rt::Implements<SystemClock, rt::Object, Clock> {
 public:
  int now() const override { return 42; }
};

namespace {

rt::Ref<rt::Object> makeClock(SRLScopeTagSet /*tags*/) {
  return rt::make<SystemClock>();
}

constexpr SRLAPIRegistrationData clockAPI{
    .identifier = "Clock", .instanceType = {.names = {.protocolName = "Clock"}}, .identifierLength = 5};
constexpr SRLImplementationRegistrationData systemClock{
    .identifier = "SystemClock", .instanceType = {.className = "SystemClock"}, .factory = makeClock};
constexpr const SRLImplementationRegistrationData* clocks[] = {&systemClock, nullptr};
constexpr _SRLBindingRegistrationData bindings[] = {{&clockAPI, clocks}};
static_assert(SRLAreBindingsSorted(bindings));
constexpr SRLBindingsModuleData module{.bindingsBegin = std::begin(bindings),
                                       .bindingsEnd = std::end(bindings)};

const SRLBindingsModuleData* clockBindings() {
  return &module;
}

}  // namespace

template struct rt::AddedClassMethod<SRLRegistry, "srl_bindingsClock", &clockBindings>;

int main() {
  const rt::Ref<Clock> clock = rt::cast<Clock>(SRLRegistry::sharedInstance()->internalService(&clockAPI, {}));
  std::printf("%d\n", clock ? clock->now() : 0);
  return 0;
}
