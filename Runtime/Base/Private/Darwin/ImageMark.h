#pragma once

// Included by Runtime/Base/Private/LoadedImages.h only.

// The system calls the initialisers of an image source file by source file, in the order in which they were
// linked. Priorities only order those of one source file. So the first initialiser that runs announces
// everything that the image has, and the others do nothing. A static object of a source file that is linked
// before all those that mention a class is initialised before the announcement.
//
// Everything here is hidden. The loader may bind an exported inline function to another image's copy, which
// would then announce for both. It even refuses to start a program with such an initialiser.

namespace rt::detail {

// The mark and its state in one. It is in a section of its own, where other images find it.
[[gnu::visibility("hidden"), gnu::used,
  gnu::section("__DATA,__rt_image")]] inline constinit ImageState imageState;

// An entry of the list below.
class Announcement {
 public:
  constexpr explicit Announcement(void (*function)()) noexcept : function_(function) {}

  void operator()() const { function_(); }

 private:
  void (*function_)();
};

// The list of the image's announcements. The linker names both ends of a section.
[[gnu::visibility("hidden")]] extern const Announcement announcementsBegin[] asm(
    "section$start$__DATA_CONST$__rt_announce");
[[gnu::visibility("hidden")]] extern const Announcement announcementsEnd[] asm(
    "section$end$__DATA_CONST$__rt_announce");

// Emitted into each source file that refers to it. The system calls it when it loads the image.
[[gnu::constructor(101), gnu::visibility("hidden")]] inline void announceImage() {
  announce(imageState, announcementsBegin, announcementsEnd);
}

// Emitted where `run` is mentioned. Announces `entry` when the image is loaded.
template <auto& entry>
struct AnnouncedOnLoading {
  [[gnu::visibility("hidden")]] static void run() {
    static_cast<void>(&announceImage);
    static_cast<void>(&listed);
    announce(entry);
  }

  [[gnu::visibility("hidden"), gnu::used,
    gnu::section("__DATA_CONST,__rt_announce")]] static constexpr Announcement listed{&run};
};

}  // namespace rt::detail
