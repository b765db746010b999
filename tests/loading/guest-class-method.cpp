// Adds a class method and gives an object of one of the program's classes.
#include "Registry.h"
#include "Runtime/Objects/ClassMethod.h"
#include "Runtime/Objects/String.h"
#include "guest.h"

namespace {

int method() {
  return 5;
}

}  // namespace

template struct rt::AddedClassMethod<Registry, "add_E", &method>;

extern "C" [[gnu::visibility("default")]] void give(rt::Ref<rt::Object>& gift) {
  gift = rt::String::fromUTF8("a copy");
}
