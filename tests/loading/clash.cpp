// Has three classes of one name and two of another, and a protocol of each name. Prints which class is
// found by the first name: 1 if it is one of the three.
#include <cstdio>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"

namespace one {
struct P : rt::Protocol<P> {
 protected:
  ~P() = default;
};
class Three : public rt::Implements<Three, rt::Object, P> {};
class Two : public rt::Implements<Two, rt::Object> {};
}  // namespace one
namespace two {
struct P : rt::Protocol<P> {
 protected:
  ~P() = default;
};
class Three : public rt::Implements<Three, rt::Object, P> {};
class Two : public rt::Implements<Two, rt::Object> {};
}  // namespace two
class Three : public rt::Implements<Three, rt::Object> {};

int main() {
  const rt::Ref<rt::Object> objects[] = {rt::make<one::Three>(), rt::make<two::Three>(), rt::make<Three>()};
  const rt::Ref<rt::Object> others[] = {rt::make<one::Two>(), rt::make<two::Two>()};
  int found = 0;
  for (const auto& object : objects) found += object->isMemberOf(*rt::classNamed("Three")) ? 1 : 0;
  for (const auto& object : others) found += object->isMemberOf(*rt::classNamed("Two")) ? 1 : 0;
  std::printf("%d\n", found);
}
