#include "Runtime/Base/Private/LoadedImages.h"

#include <dlfcn.h>
#include <mach-o/dyld.h>
#include <mach-o/getsect.h>
#include <mach-o/loader.h>

#include <cstdint>
#include <cstdio>

namespace rt::detail {

void keepImage(const ImageState& state) noexcept {
  Dl_info image{};
  if (dladdr(&state, &image) == 0) return;
  if (static_cast<const mach_header_64*>(image.dli_fbase)->filetype == MH_EXECUTE) return;
  // The handle is never closed, so that no other handle is the last one.
  if (dlopen(image.dli_fname, RTLD_LAZY | RTLD_NOLOAD | RTLD_NODELETE) != nullptr) return;
  std::fprintf(stderr, "rt: \"%s\" cannot be kept from being unloaded; it must not be closed\n",
               image.dli_fname);
}

bool areAllImagesAnnounced() noexcept {
  for (std::uint32_t i = 0; i < _dyld_image_count(); ++i) {
    const auto* image = reinterpret_cast<const mach_header_64*>(_dyld_get_image_header(i));
    unsigned long size = 0;
    const std::uint8_t* section = getsectiondata(image, "__DATA", "__rt_image", &size);
    if (section != nullptr && !reinterpret_cast<const ImageState*>(section)->isAnnounced) return false;
  }
  return true;
}

}  // namespace rt::detail
