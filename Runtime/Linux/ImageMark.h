#pragma once

// Included by Runtime/LoadedImages.h only.

namespace rt::detail {

/// What the mark of an image leads to. Hidden, so that each image has its own.
struct ImageState {
  bool isAnnounced = false;
};
[[gnu::visibility("hidden")]] inline constinit ImageState imageState;

inline constexpr char kImageMarkName[] = "rt-image";
inline constexpr unsigned kImageMarkType = 1;

/// Emitted into each image that refers to it, together with the mark: an ELF note, which no linker
/// discards and which can be found from the image's program headers. It holds the distance from itself
/// to the image's state, since a pointer would have to be written when the image is loaded.
[[gnu::constructor(102), gnu::visibility("hidden")]] inline void announceImage() {
  asm volatile(
      ".pushsection .note.rt-image, \"a\", %%note\n"
      "  .balign 4\n"
      "  .long 9, 8, %c0\n"
      "  .asciz \"rt-image\"\n"
      "  .balign 4\n"
      "  .quad %c1 - .\n"
      ".popsection"
      :
      : "i"(kImageMarkType), "i"(&imageState));
  if (imageState.isAnnounced) return;
  imageState.isAnnounced = true;
  runLoadHooksWhenComplete();
}

/// Emitted where it is mentioned: announces `entry` in the first round when the image is loaded. g++ forgets
/// the priority of [[gnu::constructor]] in templates, so what that would do is written out. Hidden, since
/// only such a function has an address that the operand may be.
template <auto& entry>
struct AnnouncedOnLoading {
  [[gnu::used, gnu::visibility("hidden")]] static void run() {
    asm volatile(
        ".pushsection .init_array.00101, \"aw\", %%init_array\n"
        "  .balign 8\n"
        "  .quad %c0\n"
        ".popsection"
        :
        : "i"(&run));
    static_cast<void>(&announceImage);
    announce(entry);
  }
};

}  // namespace rt::detail
