#include "Shared/ServiceRegistry/Source/SRLProviderFromFunction.h"

rt::Ref<AVOProvider> SRLProviderFromFunction(rt::Ref<rt::Object> (*function)()) {
  return AVOProvider::providerWithBlock(function);
}
