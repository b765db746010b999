// A program without bindings modules and with the default start-up hook. The registry reports a missing
// service, because it knows that no module will be registered later.
#include <cstdio>
#include <string>

#include "Libraries/Util/ErrorHandler/PECErrorHandler.h"
#include "Shared/ServiceRegistry/ServiceRegistry.h"
#include "Shared/ServiceRegistry/Source/SRLStartUpHook.h"

int main() {
  std::string reported;
  PECErrorHandler::sharedInstance()->setErrorHandlerBlock(
      [&](const rt::Ref<PECErrorDescription>& error) { reported += error->errorMessage().view(); });
  constexpr SRLAPIRegistrationData clockAPI{.identifier = "Clock", .identifierLength = 5};
  const rt::Ref<SRLRegistry> registry = SRLRegistry::sharedInstance();
  const bool isFound = registry->internalService(&clockAPI, {}) != nullptr;
  if (SRLStartUpHook() && !isFound && registry->registeredAPIIdentifiers()->isEmpty() &&
      reported == "No binding was found for required, single-bound service: Clock") {
    return 0;
  }
  std::fprintf(stderr, "%s, and reported: %s\n", isFound ? "found" : "not found", reported.c_str());
  return 1;
}
