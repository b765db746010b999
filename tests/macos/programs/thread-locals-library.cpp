#include "thread-locals.h"

namespace {

thread_local int number = 100;

}  // namespace

int nextOfLibrary() {
  return ++number;
}
