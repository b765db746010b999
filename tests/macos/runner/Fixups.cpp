#include "Fixups.h"

#include "ChainedFixups.h"
#include "FixupOpcodes.h"

void fixUp(const Image& image, const Resolve& resolve) {
  if (image.chainedFixups()) {
    followChains(image, *image.chainedFixups(), resolve);
  } else if (image.fixupOpcodes()) {
    obeyOpcodes(image, *image.fixupOpcodes(), resolve);
  }
}
