// Gives a format that was made of a plain string literal.
#include "Runtime/Text/FormatString.h"
#include "guest.h"

extern "C" [[gnu::visibility("default")]] void give(rt::Ref<rt::Object>& gift) {
  static constexpr rt::FormatString<int> kFormat("%d formats");
  gift = kFormat.string();
}
