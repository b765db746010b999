#pragma once

// Included by Runtime/Base/LoadedImages.h only.

// An image has one initialiser for all its announcements, whatever the number of classes. Each source file
// names the classes that it mentions, in a section of distances that need no relocation. `announceImage`
// walks that section. One call for each class in each source file would make hundreds of initialisers.

#include <cstdint>

namespace rt::detail {

/// What the mark of an image leads to. Hidden, so that each image has its own.
struct ImageState {
  bool isAnnounced = false;
};
[[gnu::visibility("hidden")]] inline constinit ImageState imageState;

/// Calls the functions of the image whose state this is, notes that it has announced what it has, and runs
/// the load hooks where it was the last. Does nothing when it is called again.
void announce(ImageState& state, const std::int32_t* begin, const std::int32_t* end) noexcept;

inline constexpr char kImageMarkName[] = "rt-image";
inline constexpr unsigned kImageMarkType = 1;

// What an image announces: for each function to call, its distance from where the distance is written, so
// that nothing has to be written when the image is loaded. The linker puts them together and names both ends.
[[gnu::weak,
  gnu::visibility("hidden")]] extern const std::int32_t announcementsBegin[] asm("__start_rt_announcements");
[[gnu::weak,
  gnu::visibility("hidden")]] extern const std::int32_t announcementsEnd[] asm("__stop_rt_announcements");

// clang runs initialisers of static objects while it compiles, so it must know what goes before them: the
// attribute tells, and leaves one call for each source file. g++ takes it from the section that the function
// puts itself in, once for the image.
#if defined(__clang__)
#define RT_CALLED_ON_LOADING gnu::constructor(102)
#define RT_CALL_ON_LOADING
#else
#define RT_CALLED_ON_LOADING gnu::used
#define RT_CALL_ON_LOADING                                                    \
  ".pushsection .init_array.00102, \"awG\", %%init_array, rt_image, comdat\n" \
  "  .balign 8\n"                                                             \
  "  .quad %c2\n"                                                             \
  ".popsection\n"
#endif

/// Emitted into each image that refers to it, together with the mark: an ELF note, which no linker discards
/// unless it is in a group, and which is found from the image's program headers. The note holds the distance
/// from itself to the image's state. Called when the image is loaded.
[[RT_CALLED_ON_LOADING, gnu::visibility("hidden")]] inline void announceImage() {
  asm volatile(
      ".pushsection .note.rt-image, \"a\", %%note\n"
      "  .balign 4\n"
      "  .long 9, 8, %c0\n"
      "  .asciz \"rt-image\"\n"
      "  .balign 4\n"
      "  .quad %c1 - .\n"
      ".popsection\n" RT_CALL_ON_LOADING
      :
      : "i"(kImageMarkType), "i"(&imageState), "i"(&announceImage));
  announce(imageState, announcementsBegin, announcementsEnd);
}

#undef RT_CALLED_ON_LOADING
#undef RT_CALL_ON_LOADING

/// Emitted where it is mentioned, in each source file: announces `entry` when the image is loaded. Hidden,
/// since only such a function has an address that the operand may be.
template <auto& entry>
struct AnnouncedOnLoading {
  [[gnu::used, gnu::visibility("hidden")]] static void run() {
    asm volatile(
        ".pushsection rt_announcements, \"aR?\", %%progbits\n"
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
