// A service that conforms to two protocols. The program finds it by its class name, uses it through either
// protocol, and asks which protocols it conforms to.

#include <cstdio>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Text/Format.h"

using namespace rt::literals;

struct Greeter : rt::Protocol<Greeter> {
  virtual rt::String greetingFor(const rt::String& name) const = 0;

 protected:
  ~Greeter() = default;
};

struct Counter : rt::Protocol<Counter> {
  virtual int count() const = 0;

 protected:
  ~Counter() = default;
};

class PoliteGreeter final : public rt::Implements<PoliteGreeter, rt::Object, Greeter, Counter> {
 public:
  rt::String greetingFor(const rt::String& name) const override {
    ++count_;
    return rt::format("Good morning, %@."_s, name);
  }
  int count() const override { return count_; }

 private:
  mutable int count_ = 0;
};

int main() {
  const rt::Ref<Greeter> greeter = rt::make<PoliteGreeter>();
  for (const rt::String& name : {"Ann"_s, "Bob"_s}) {
    const rt::String greeting = greeter->greetingFor(name);
    std::printf("%.*s\n", static_cast<int>(greeting.length()), greeting.view().data());
  }

  // The same object, through its second protocol.
  if (const rt::Ref<Counter> counter = rt::cast<Counter>(greeter)) {
    std::printf("%d greetings\n", counter->count());
  }

  const rt::ClassInfo* const found = rt::classNamed("PoliteGreeter");
  std::printf("%s\n",
              found == &rt::classInfo<PoliteGreeter>() && found->conformsTo(rt::protocolInfo<Greeter>())
                  ? "PoliteGreeter is a Greeter"
                  : "no such class");
}
