// A program of somebody who has only what was installed. Hears of a mistake of its own.
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
