// A host that is built against the installed libraries only. It prints the number that a provider returns.
#include <cstdio>

#include "Runtime/Values/Number.h"
#include "Shared/Async/Provider/AVOProvider.h"

int main() {
  const rt::Ref<AVOProvider> provider = AVOProvider::providerWithBlock([] { return rt::Number::of(42); });
  std::printf("%lld\n", static_cast<long long>(rt::cast<rt::Number>(provider->get().get())->integerValue()));
  return 0;
}
