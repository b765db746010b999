// A host that is built against the installed libraries only. It registers two callbacks, and the first one
// prints the error that this reports.
#include <cstdio>

#include "Libraries/Util/ErrorHandler/ErrorHandler.h"

int main() {
  const PECErrorHandlerBlock block = [](const rt::Ref<PECErrorDescription>& error) {
    std::printf("%d\n", static_cast<int>(error->lineNumber()) - 30);
  };
  PECErrorHandler::sharedInstance()->registerErrorHandlerBlock(block);
  PECErrorHandler::sharedInstance()->registerErrorHandlerBlock(block);
  return 0;
}
