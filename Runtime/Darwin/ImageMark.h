#pragma once

// Included by Runtime/LoadedImages.h only.

namespace rt::detail {

/// The mark. The system calls an image's functions source file by source file, by priority only within
/// each, so that every source file has a mark of its own and says for itself that it is done.
struct ImageState {
  bool isAnnounced = false;
};
[[gnu::used, gnu::section("__DATA,__rt_image")]] static constinit ImageState imageState;

[[gnu::used, gnu::constructor(kAnnounced)]] static void announceSourceFile() {
  imageState.isAnnounced = true;
  runLoadHooksWhenComplete();
}

/// What records refer to so that their image is marked; here it is in any case.
inline void announceImage() {}

}  // namespace rt::detail
