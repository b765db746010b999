#pragma once

// Included by Runtime/Base/Private/LoadedImages.h only.

namespace rt::detail {

/// The mark. The system calls an image's functions source file by source file, by priority only within
/// each, so that every source file has a mark of its own and says for itself that it is done.
struct ImageState {
  bool isAnnounced = false;
};
[[gnu::used, gnu::section("__DATA,__rt_image")]] static constinit ImageState imageState;

[[gnu::used, gnu::constructor(102)]] static void announceSourceFile() {
  imageState.isAnnounced = true;
  keepImage(imageState);
  runLoadHooksWhenComplete();
}

/// Emitted where it is mentioned: announces `entry` in the first round.
template <auto& entry>
struct AnnouncedOnLoading {
  [[gnu::constructor(101)]] static void run() { announce(entry); }
};

}  // namespace rt::detail
