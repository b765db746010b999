// Gives an object of its own class.
#include "Runtime/Objects/String.h"
#include "guest.h"

namespace {

class A final : public rt::Implements<A, rt::Object> {
 public:
  rt::String description() const override { return rt::String::fromUTF8("an A"); }
};

}  // namespace

extern "C" [[gnu::visibility("default")]] void give(rt::Ref<rt::Object>& gift) {
  gift = rt::make<A>();
}
