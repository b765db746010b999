#include "Shared/ServiceRegistry/Source/SRLStartUpHook.h"

[[gnu::weak]] bool SRLStartUpHook() {
  return true;
}
