// Adds a class LETTER and a class method "add_LETTER". No symbol outside this file refers to them.
#include "Registry.h"
#include "Runtime/Objects/ClassMethod.h"

#define TEXT(x) #x
#define TEXT_OF(x) TEXT(x)

class [[gnu::visibility("default")]] LETTER : public rt::Implements<LETTER, rt::Object> {
 public:
  ~LETTER() override;
};
LETTER::~LETTER() = default;

namespace {

int method() {
  return NUMBER;
}
int otherMethod(int value) {
  return value;
}

}  // namespace

template struct rt::AddedClassMethod<Registry, "add_" TEXT_OF(LETTER), &method>;
template struct rt::AddedClassMethod<LETTER, "not_the_registry's", &method>;
#ifdef ODD
template struct rt::AddedClassMethod<Registry, "odd", &otherMethod>;
#else
template struct rt::AddedClassMethod<LETTER, "not_the_registry's_either", &otherMethod>;
#endif
