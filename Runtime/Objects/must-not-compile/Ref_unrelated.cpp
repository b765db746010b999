// A reference converts to a base class and to a protocol of its class, and to nothing else.
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"

struct Clock : rt::Protocol<Clock> {
 protected:
  ~Clock() = default;
};

class SystemClock : public rt::Implements<SystemClock, rt::Object, Clock> {};
class Stone : public rt::Implements<Stone, rt::Object> {};

rt::Ref<rt::Object> toBase(const rt::Ref<Stone>& stone) {
  return stone;
}
rt::Ref<Clock> toProtocol(const rt::Ref<SystemClock>& clock) {
  return clock;
}

#ifdef UNRELATED_CLASS
rt::Ref<SystemClock> unrelated(const rt::Ref<Stone>& stone) {
  return stone;
}
#endif
#ifdef UNRELATED_PROTOCOL
rt::Ref<Clock> unrelated(const rt::Ref<Stone>& stone) {
  return stone;
}
#endif
#ifdef TO_SUBCLASS
rt::Ref<Stone> unrelated(const rt::Ref<rt::Object>& object) {
  return object;
}
#endif
