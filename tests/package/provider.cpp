// A program of somebody who has only what was installed. Prints what a provider provides.
#include <cstdio>

#include "Runtime/Values/Number.h"
#include "Shared/Async/Provider/AVOProvider.h"

int main() {
  const rt::Ref<AVOProvider> provider = AVOProvider::providerWithBlock([] { return rt::Number::of(42); });
  std::printf("%lld\n", static_cast<long long>(rt::cast<rt::Number>(provider->get().get())->integerValue()));
  return 0;
}
