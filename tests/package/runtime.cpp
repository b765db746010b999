// A host that is built against the installed libraries only. It finds a factory by its selector and prints
// the time of the clock that the factory makes.
#include "Runtime/Runtime.h"

#include <cstdio>

struct Clock : rt::Protocol<Clock> {
  virtual int now() const = 0;

 protected:
  ~Clock() = default;
};

class SystemClock final : public rt::Implements<SystemClock, rt::Object, Clock> {
 public:
  static inline rt::Ref<rt::Object> (*factory)() = nullptr;

  static void load() {
    for (const rt::ClassMethod& method : rt::classMethods(rt::classInfo<SystemClock>())) {
      if (method.selector() == "make") factory = method.as<rt::Ref<rt::Object>()>();
    }
  }
  int now() const override { return 42; }
};

rt::Ref<rt::Object> makeClock() {
  return rt::make<SystemClock>();
}

template struct rt::LoadHook<SystemClock>;
template struct rt::AddedClassMethod<SystemClock, "make", &makeClock>;

int main() {
  if (SystemClock::factory == nullptr || rt::classNamed("SystemClock") == nullptr) return 1;
  // This program does not refer to this class. It is present only if the whole library is linked.
  if (rt::classNamed("String") == nullptr) return 2;
  const rt::Ref<rt::Object> object = SystemClock::factory();
  const rt::Weak<Clock> clock = rt::cast<Clock>(object.get());
  const rt::Block<int()> ask = [clock] { return clock.lock()->now(); };
  std::printf("%d\n", ask());
  return 0;
}
