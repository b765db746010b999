// One service, bound by hand: a counter for each user, which lasts until the scope of the user ends.

#include <cstdio>
#include <iterator>
#include <string>

#include "Libraries/Util/ErrorHandler/PECErrorHandler.h"
#include "Runtime/Objects/ClassMethod.h"
#include "Shared/ServiceRegistry/Source/SRLRegistry.h"

using namespace rt::literals;

// The interface.
struct Counter : rt::Protocol<Counter> {
  virtual int next() = 0;

 protected:
  ~Counter() = default;
};

namespace {

// The implementation.
class UserCounter final : public rt::Implements<UserCounter, rt::Object, Counter> {
 public:
  int next() override { return ++count_; }

 private:
  int count_ = 0;
};

// The factory: makes an instance.
rt::Ref<rt::Object> makeUserCounter(SRLScopeTagSet /*tags*/) {
  return rt::make<UserCounter>();
}

// The bindings. One bit for each dimension of scopes: here there is one, the user.
constexpr SRLScopeType kUser = 0b1;

constexpr SRLAPIRegistrationData counterAPI{
    .identifier = "Counter",
    .instanceType = {.names = {.protocolName = "Counter"}},
    .scopeType = kUser,
    .identifierLength = 7,
};
constexpr SRLImplementationRegistrationData userCounter{
    .identifier = "UserCounter",
    .instanceType = {.className = "UserCounter"},
    .factory = makeUserCounter,
    .scopeType = kUser,
};

constexpr const SRLImplementationRegistrationData* counters[] = {&userCounter, nullptr};
constexpr _SRLBindingRegistrationData bindings[] = {{&counterAPI, counters}};
static_assert(SRLAreBindingsSorted(bindings));

// The injector: what the rest of the program calls.
rt::Ref<Counter> injectCounter(const rt::Ref<rt::Object>& user) {
  const SRLScopeTagSet tags{{user.get()}};
  return rt::cast<Counter>(SRLRegistry::sharedInstance()->internalService(&counterAPI, tags));
}

// The module: what the registry is handed when the program is loaded.
constexpr SRLBindingsModuleData module{.bindingsBegin = std::begin(bindings),
                                       .bindingsEnd = std::end(bindings)};

const SRLBindingsModuleData* counterBindings() {
  return &module;
}

}  // namespace

template struct rt::AddedClassMethod<SRLRegistry, "srl_bindingsCounter", &counterBindings>;

int main() {
  const rt::Ref<rt::Object> ann = "Ann"_s.object();
  const rt::Ref<rt::Object> bob = "Bob"_s.object();
  std::printf("Ann %d\n", injectCounter(ann)->next());
  std::printf("Ann %d\n", injectCounter(ann)->next());
  std::printf("Bob %d\n", injectCounter(bob)->next());

  SRLRegistry::sharedInstance()->removeScopesWithTag(ann);
  std::printf("Ann %d\n", injectCounter(ann)->next());

  PECErrorHandler::sharedInstance()->registerErrorHandlerBlock([](const rt::Ref<PECErrorDescription>& error) {
    std::printf("error: %s\n", std::string(error->errorMessage()).c_str());
  });
  SRLRegistry::sharedInstance()->removeScopesWithTag(nullptr);
}
