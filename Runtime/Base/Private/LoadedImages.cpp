// An image with classes is never unloaded, because its objects, literals and class methods may be anywhere in
// the program. `announce` has the loader keep the image. A linker option would not do: it would not reach a
// plug-in that takes the runtime from its host.

#include "Runtime/Base/Private/LoadedImages.h"

namespace rt::detail {

void announce(ImageState& state, const Announcement* begin, const Announcement* end) noexcept {
  if (state.isAnnounced) return;
  for (const Announcement* each = begin; each != end; ++each) (*each)();
  state.isAnnounced = true;
  keepImage(state);
  runLoadHooksWhenComplete();
}

}  // namespace rt::detail
