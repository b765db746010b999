#pragma once

// Included by Runtime/Base/Private/LoadedImages.h only.

// An image has one initialiser for all its announcements, whatever the number of classes. Each source file
// names the classes that it mentions, in a section of distances that need no relocation. `announceImage`
// walks that section. One call for each class in each source file would make hundreds of initialisers.

#include <cstdint>

namespace rt::detail {

// The state that the mark of an image leads to. It is hidden, so that each image has its own.
[[gnu::visibility("hidden")]] inline constinit ImageState imageState;

inline constexpr char kImageMarkName[] = "rt-image";
inline constexpr unsigned kImageMarkType = 1;

// The distance from this object to a function, so that loading the image needs no relocation.
class Announcement {
 public:
  Announcement() = delete;  // Only `AnnouncedOnLoading` makes one, below.
  Announcement(const Announcement&) = delete;
  Announcement& operator=(const Announcement&) = delete;

  void operator()() const {
    const std::uintptr_t address =
        reinterpret_cast<std::uintptr_t>(this) + static_cast<std::uintptr_t>(std::intptr_t{distance_});
    reinterpret_cast<void (*)()>(address)();  // NOLINT(performance-no-int-to-ptr): the linker says so
  }

 private:
  std::int32_t distance_;
};

// The list of the image's announcements. The linker joins them and names both ends of the list.
[[gnu::weak,
  gnu::visibility("hidden")]] extern const Announcement announcementsBegin[] asm("__start_rt_announcements");
[[gnu::weak,
  gnu::visibility("hidden")]] extern const Announcement announcementsEnd[] asm("__stop_rt_announcements");

// clang may run initialisers of static objects at compile time, so it must know what runs before them. The
// attribute tells it that, and makes one call for each source file. With g++, the function puts itself into a
// section, which makes one call for the image.
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

// Emitted into each image that refers to it, together with the mark. The mark is an ELF note, which is found
// from the image's program headers. No linker discards a note, unless it is in a group. The note holds the
// distance from itself to the image's state. The system calls this function when it loads the image.
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

// Emitted where it is mentioned, in each source file. Announces `entry` when the image is loaded. It is
// hidden, since the operand can only be the address of a hidden function.
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
