#pragma once

// Included by Runtime/LoadedImages.h only.

#include <cstdint>

namespace rt::detail {

/// What the mark of an image leads to. Hidden, so that each image has its own.
struct ImageState {
  bool isAnnounced = false;
};
[[gnu::visibility("hidden")]] inline constinit ImageState imageState;

/// Calls the functions of the image whose state this is, notes that it has announced what it has, and runs
/// the load hooks where it was the last.
void announce(ImageState& state, const std::int32_t* begin, const std::int32_t* end) noexcept;

inline constexpr char kImageMarkName[] = "rt-image";
inline constexpr unsigned kImageMarkType = 1;

// What an image announces: for each function to call, its distance from where the distance is written, so
// that nothing has to be written when the image is loaded. The linker puts them together and names both ends.
[[gnu::weak,
  gnu::visibility("hidden")]] extern const std::int32_t announcementsBegin[] asm("__start_rt_announcements");
[[gnu::weak,
  gnu::visibility("hidden")]] extern const std::int32_t announcementsEnd[] asm("__stop_rt_announcements");

/// Emitted into each image that refers to it, once, together with the mark: an ELF note, which no linker
/// discards and which can be found from the image's program headers. It holds the distance from itself
/// to the image's state. [[gnu::constructor]] would leave one call for each source file.
[[gnu::used, gnu::visibility("hidden")]] inline void announceImage() {
  asm volatile(
      ".pushsection .note.rt-image, \"aG\", %%note, rt_image, comdat\n"
      "  .balign 4\n"
      "  .long 9, 8, %c0\n"
      "  .asciz \"rt-image\"\n"
      "  .balign 4\n"
      "  .quad %c1 - .\n"
      ".popsection\n"
      ".pushsection .init_array.00102, \"awG\", %%init_array, rt_image, comdat\n"
      "  .balign 8\n"
      "  .quad %c2\n"
      ".popsection"
      :
      : "i"(kImageMarkType), "i"(&imageState), "i"(&announceImage));
  announce(imageState, announcementsBegin, announcementsEnd);
}

/// Emitted where it is mentioned, in each source file: announces `entry` when the image is loaded. Hidden,
/// since only such a function has an address that the operand may be.
template <auto& entry>
struct AnnouncedOnLoading {
  [[gnu::used, gnu::visibility("hidden")]] static void run() {
    asm volatile(
        ".pushsection rt_announcements, \"aR\", %%progbits\n"
        "  .balign 4\n"
        "  .long %c0 - .\n"
        ".popsection"
        :
        : "i"(&run));
    static_cast<void>(&announceImage);
    announce(entry);
  }
};

}  // namespace rt::detail
