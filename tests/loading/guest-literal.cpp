// Gives a string literal.
#include "Runtime/Objects/String.h"
#include "guest.h"

using namespace rt::literals;

extern "C" [[gnu::visibility("default")]] void give(rt::Ref<rt::Object>& gift) {
  gift = "a literal"_s;
}
