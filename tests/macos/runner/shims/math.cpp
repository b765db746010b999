#include <cmath>

#include "tests/macos/runner/Shims.h"

shims::Table shims::math() {
  static const Shim table[] = {
      shim<double(double)>("ceil", ::ceil),         shim<float(float)>("ceilf", ::ceilf),
      shim<double(double)>("cos", ::cos),           shim<double(double)>("floor", ::floor),
      shim<double(double, double)>("fmod", ::fmod), shim<double(double, int*)>("frexp", ::frexp),
      shim<double(double, int)>("ldexp", ::ldexp),  shim<double(double)>("log", ::log),
      shim<double(const char*)>("nan", ::nan),      shim<double(double, double)>("nextafter", ::nextafter),
      shim<double(double, double)>("pow", ::pow),   shim<double(double)>("trunc", ::trunc),
  };
  return table;
}
