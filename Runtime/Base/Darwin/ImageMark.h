#pragma once

// Included by Runtime/Base/LoadedImages.h only.

namespace rt::detail {

// The mark and its state in one. The system calls the functions of an image source file by source file.
// Priorities only order those of one source file. So every source file has a mark of its own and notes for
// itself that it is done.
struct ImageState {
  bool isAnnounced = false;
};
[[gnu::used, gnu::section("__DATA,__rt_image")]] static constinit ImageState imageState;

[[gnu::used, gnu::constructor(102)]] static void announceSourceFile() {
  imageState.isAnnounced = true;
  keepImage(imageState);
  runLoadHooksWhenComplete();
}

// Emitted where it is mentioned. Announces `entry` in the first round, at priority 101.
template <auto& entry>
struct AnnouncedOnLoading {
  [[gnu::constructor(101)]] static void run() { announce(entry); }
};

}  // namespace rt::detail
