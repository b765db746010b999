// Opens and closes another guest library while it is being opened itself. Gives the object that the other one
// gave.
#include <dlfcn.h>

#include "guest.h"

namespace {

const rt::Ref<rt::Object> nestedGift = [] {
  rt::Ref<rt::Object> gift;
  void* const guest = dlopen(NESTED, RTLD_NOW | RTLD_LOCAL);
  reinterpret_cast<Give*>(dlsym(guest, "give"))(gift);
  dlclose(guest);
  return gift;
}();

}  // namespace

extern "C" [[gnu::visibility("default")]] void give(rt::Ref<rt::Object>& gift) {
  gift = nestedGift;
}
