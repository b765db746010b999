// The default description, apart until Runtime/String.h is there.
#include "Runtime/Class.h"
#include "Runtime/Object.h"
#include "Runtime/Ref.h"

namespace rt {

class String {
 public:
  Ref<Object> buffer;
};

String Object::description() const {
  return {};
}

}  // namespace rt
