// This program has three classes called Three, two called Two, and two protocols called P. Prints how many
// objects are members of the class that is found by their name: 2, because exactly one class of each name is
// found.
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
