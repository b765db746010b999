// clang refuses a reference into an object that only a temporary `Ref` keeps alive.

#include "Runtime/Objects/Ref.h"
#include "Runtime/Values/Array.h"

rt::Ref<rt::Array> names();

std::uint64_t walk() {
  std::uint64_t hash = 0;
#ifdef LOOP_OVER_A_TEMPORARY
  for (const rt::Ref<rt::Object>& name : *names()) hash += name->hash();
#else
  const rt::Ref<rt::Array> kept = names();
  for (const rt::Ref<rt::Object>& name : *kept) hash += name->hash();
#endif
  return hash + (*names()).count();
}
