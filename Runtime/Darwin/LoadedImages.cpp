#include "Runtime/LoadedImages.h"

#include <mach-o/dyld.h>
#include <mach-o/getsect.h>
#include <mach-o/loader.h>

#include <algorithm>
#include <cstdint>
#include <span>

namespace rt::detail {

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
