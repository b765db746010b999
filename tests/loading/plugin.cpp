// A library that plugin-host opens. It adds a class method and a class with its own load hook.
#include "Registry.h"
#include "Runtime/Objects/ClassMethod.h"
#include "Runtime/Objects/LoadHook.h"

namespace {

constinit char seen[256] = "";

class D : public rt::Implements<D, rt::Object> {
 public:
  static void load() { Registry::look().copy(seen, sizeof seen - 1); }
};

int method() {
  return 4;
}

}  // namespace

template struct rt::LoadHook<D>;
template struct rt::AddedClassMethod<Registry, "add_D", &method>;

extern "C" [[gnu::visibility("default")]] const char* seenByPlugin() {
  return seen;
}
