// The bindings, in the form that a generator writes: constant records, a factory for each implementation and
// an injector for each service. The registry finds them by a class method when the program is loaded.

#include "bindings.h"

#include <iterator>
#include <utility>

#include "Runtime/Objects/ClassMethod.h"
#include "Runtime/Text/Format.h"
#include "Shared/ServiceRegistry/Source/SRLRegistry.h"

using namespace rt::literals;

namespace {

// The dimensions of scopes, one bit each. Tags are given in the order of the bits.
constexpr SRLScopeType kAccount = 0b01;
constexpr SRLScopeType kWindow = 0b10;

class AccountStore final : public rt::Implements<AccountStore, rt::Object, MessageStore> {
 public:
  explicit AccountStore(rt::String name) : name_(std::move(name)) {}
  rt::String name() const override { return name_; }

 private:
  const rt::String name_;
};

class WindowList final : public rt::Implements<WindowList, rt::Object, MessageList> {
 public:
  WindowList(rt::Ref<MessageStore> store, rt::String window)
      : store_(std::move(store)), window_(std::move(window)) {}
  rt::String title() const override { return rt::format("%@ in %@"_s, store_->name(), window_); }

 private:
  const rt::Ref<MessageStore> store_;
  const rt::String window_;
};

class Greeting final : public rt::Implements<Greeting, rt::Object, WindowTask> {
 public:
  rt::String label() const override { return "greet"_s; }
};

// A factory receives the tags of its implementation's scope, and asks the injectors for what it needs.
rt::Ref<rt::Object> makeAccountStore(SRLScopeTagSet tags) {
  return rt::make<AccountStore>(rt::String::from(tags.tags[0]));
}
rt::Ref<rt::Object> makeWindowList(SRLScopeTagSet tags) {
  return rt::make<WindowList>(injectMessageStore(tags.tags[0]), rt::String::from(tags.tags[1]));
}
rt::Ref<rt::Object> makeGreeting(SRLScopeTagSet /*tags*/) {
  return rt::make<Greeting>();
}

constexpr SRLAPIRegistrationData messageStoreAPI{
    .identifier = "MessageStore",
    .instanceType = {.names = {.protocolName = "MessageStore"}},
    .scopeType = kAccount,
    .identifierLength = 12,
};
constexpr SRLAPIRegistrationData messageListAPI{
    .identifier = "MessageList",
    .instanceType = {.names = {.protocolName = "MessageList"}},
    .scopeType = kAccount | kWindow,
    .identifierLength = 11,
};
constexpr SRLAPIRegistrationData windowTaskAPI{
    .identifier = "WindowTask",
    .instanceType = {.names = {.protocolName = "WindowTask"}},
    .scopeType = kAccount,
    .identifierLength = 10,
    .isMultibound = 1,
};

constexpr SRLImplementationRegistrationData accountStore{
    .identifier = "AccountStore",
    .instanceType = {.className = "AccountStore"},
    .factory = makeAccountStore,
    .scopeType = kAccount,
};
constexpr SRLImplementationRegistrationData windowList{
    .identifier = "WindowList",
    .instanceType = {.className = "WindowList"},
    .factory = makeWindowList,
    .scopeType = kAccount | kWindow,
};
constexpr SRLImplementationRegistrationData greeting{
    .identifier = "Greeting",
    .instanceType = {.className = "Greeting"},
    .factory = makeGreeting,
    .lifetime = 1,
};

constexpr const SRLImplementationRegistrationData* messageStores[] = {&accountStore, nullptr};
constexpr const SRLImplementationRegistrationData* messageLists[] = {&windowList, nullptr};
constexpr const SRLImplementationRegistrationData* windowTasks[] = {&greeting, nullptr};

constexpr _SRLBindingRegistrationData bindings[] = {
    {&windowTaskAPI, windowTasks},
    {&messageListAPI, messageLists},
    {&messageStoreAPI, messageStores},
};
static_assert(SRLAreBindingsSorted(bindings));

constexpr SRLBindingsModuleData module{.bindingsBegin = std::begin(bindings),
                                       .bindingsEnd = std::end(bindings)};

const SRLBindingsModuleData* mailBindings() {
  return &module;
}

}  // namespace

template struct rt::AddedClassMethod<SRLRegistry, "srl_bindingsMail", &mailBindings>;

rt::Ref<MessageStore> injectMessageStore(const rt::Ref<rt::Object>& account) {
  const SRLScopeTagSet tags{{account.get()}};
  return rt::cast<MessageStore>(SRLRegistry::sharedInstance()->internalService(&messageStoreAPI, tags));
}

rt::Ref<MessageList> injectMessageList(const rt::Ref<rt::Object>& account,
                                       const rt::Ref<rt::Object>& window) {
  const SRLScopeTagSet tags{{account.get(), window.get()}};
  return rt::cast<MessageList>(SRLRegistry::sharedInstance()->internalService(&messageListAPI, tags));
}

rt::Ref<rt::Array> injectWindowTasks(const rt::Ref<rt::Object>& account) {
  const SRLScopeTagSet tags{{account.get()}};
  return SRLRegistry::sharedInstance()->internalMultiBoundService(&windowTaskAPI, tags);
}
