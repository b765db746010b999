// A mail program. Some services live as long as an account, others as long as one window of an account. The
// program gets them from the injectors, and ends all services of an account when its user logs out.

#include <cstdio>
#include <string>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Weak.h"
#include "Runtime/Text/Format.h"
#include "Shared/ServiceRegistry/Source/SRLRegistry.h"
#include "bindings.h"

using namespace rt::literals;

namespace {

void print(const rt::String& line) {
  std::printf("%s\n", std::string(line).c_str());
}

// Reports services that are still referenced after their scope has ended.
class LeakWatch final : public rt::Implements<LeakWatch, rt::Object, SRLScopeLifecycleDelegate> {
 public:
  void didRemoveScopesWithTag(const rt::Ref<rt::Object>& tag,
                              const std::vector<rt::Weak<rt::Object>>& serviceInstances) override {
    for (const rt::Weak<rt::Object>& instance : serviceInstances) {
      if (const rt::Ref<rt::Object> leaked = instance.lock()) {
        print(rt::format("%@ is logged out; still there: %@"_s, tag,
                         rt::String::overStatic(leaked->classInfo().name)));
      }
    }
  }
};

}  // namespace

int main() {
  const rt::Ref<SRLRegistry> registry = SRLRegistry::sharedInstance();
  const rt::Ref<LeakWatch> leakWatch = rt::make<LeakWatch>();
  registry->setScopeLifecycleDelegate(leakWatch);

  // Any object may be a tag. Tags that stand for the same thing must be equal.
  const rt::Ref<rt::Object> ann = "Ann"_s.object();
  const rt::Ref<rt::Object> left = "the left window"_s.object();
  const rt::Ref<rt::Object> right = "the right window"_s.object();

  print(injectMessageList(ann, left)->title());
  print(injectMessageList(ann, right)->title());
  print(injectMessageStore(ann) == injectMessageStore(ann) ? "one store"_s : "two stores"_s);
  const rt::Ref<rt::Array> tasks = injectWindowTasks(ann);
  for (const rt::Ref<rt::Object>& task : *tasks) print(rt::cast<WindowTask>(task.get())->label());

  // The lists end with the account. The store would too, but `kept` retains it.
  const rt::Ref<MessageStore> kept = injectMessageStore(ann);
  registry->removeScopesWithTag(ann);
  print(injectMessageStore(ann) == kept ? "the same store"_s : "another store"_s);
  return 0;
}
