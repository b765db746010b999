// Classes and protocols must name themselves, and a class must name a protocol only once.
#include <string_view>

#include "Runtime/Objects/Block.h"
#include "Runtime/Objects/LoadHook.h"
#include "Runtime/Objects/Ref.h"

struct Clock : rt::Protocol<Clock> {
 protected:
  ~Clock() = default;
};

struct AlarmClock : rt::Protocol<AlarmClock, Clock> {
 protected:
  ~AlarmClock() = default;
};

class SystemClock : public rt::Implements<SystemClock, rt::Object, Clock> {};
class Rattle : public rt::Implements<Rattle, SystemClock, AlarmClock> {};

rt::Ref<rt::Object> right() {
  return rt::make<Rattle>();
}

#ifdef CLASS_WITHOUT_NAME
class Unnamed : public SystemClock {};
rt::Ref<rt::Object> wrong() {
  return rt::make<Unnamed>();
}
#endif
#ifdef SUPERCLASS_WITHOUT_NAME
class Unnamed : public SystemClock {};
class Wrong : public rt::Implements<Wrong, Unnamed> {};
#endif
#ifdef PROTOCOL_WITHOUT_NAME
struct Unnamed : Clock {
 protected:
  ~Unnamed() = default;
};
class Wrong : public rt::Implements<Wrong, rt::Object, Unnamed> {};
#endif
#ifdef PROTOCOL_OF_SUPERCLASS
class Wrong : public rt::Implements<Wrong, SystemClock, Clock> {};
#endif
#ifdef PROTOCOL_TWICE
class Wrong : public rt::Implements<Wrong, rt::Object, AlarmClock, Clock> {};
#endif
#ifdef CAST_TO_NEITHER
const int* wrong(rt::Object* object) {
  return rt::cast<int>(object);
}
#endif
#ifdef HOOK_WITHOUT_FUNCTION
template struct rt::LoadHook<SystemClock>;
#endif
#ifdef BLOCK_OF_ANOTHER_SIGNATURE
rt::Block<int(int)> wrong = [](std::string_view text) { return text.size(); };
#endif
