#include "Runtime/Base/LoadedImages.h"

#include <dlfcn.h>
#include <mach-o/dyld.h>
#include <mach-o/getsect.h>
#include <mach-o/loader.h>

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <span>

namespace rt::detail {

void keepImage(const ImageState& state) noexcept {
  Dl_info image{};
  if (dladdr(&state, &image) == 0) return;
  const auto* header = static_cast<const mach_header_64*>(image.dli_fbase);
  if (header->filetype == MH_EXECUTE) return;
  // An image has a state for each source file. Only the first of them keeps the image.
  unsigned long size = 0;
  const std::uint8_t* section = getsectiondata(header, "__DATA", "__rt_image", &size);
  if (section != reinterpret_cast<const std::uint8_t*>(&state)) return;
  if (dlopen(image.dli_fname, RTLD_LAZY | RTLD_NOLOAD | RTLD_NODELETE) != nullptr) return;
  std::fprintf(stderr, "rt: \"%s\" cannot be kept from being unloaded; it must not be closed\n",
               image.dli_fname);
}

bool areAllImagesAnnounced() noexcept {
  for (std::uint32_t i = 0; i < _dyld_image_count(); ++i) {
    const auto* image = reinterpret_cast<const mach_header_64*>(_dyld_get_image_header(i));
    unsigned long size = 0;
    const std::uint8_t* section = getsectiondata(image, "__DATA", "__rt_image", &size);
    if (section == nullptr) continue;
    const std::span states(reinterpret_cast<const ImageState*>(section), size / sizeof(ImageState));
    if (!std::ranges::all_of(states, &ImageState::isAnnounced)) return false;
  }
  return true;
}

}  // namespace rt::detail
