#include "Runtime/Base/Private/LoadedImages.h"

#include <dlfcn.h>
#include <link.h>

#include <algorithm>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstring>

// `dlsym` is weak, since a statically linked program need not have it. `dlopen` is found through `dlsym`,
// since the linker of such a program warns of a direct call.
#pragma weak dlsym

namespace rt::detail {

namespace {

// An image, found by an address in it. Its name stays valid as long as the image is loaded.
struct NamedImage {
  std::uintptr_t address;
  const char* name = nullptr;
};

// A callback. Returns 0 to go on with the next image, another value to stop.
int findImage(dl_phdr_info* image, std::size_t /*size*/, void* context) {
  NamedImage& wanted = *static_cast<NamedImage*>(context);
  for (std::size_t i = 0; i < image->dlpi_phnum; ++i) {
    const ElfW(Phdr)& segment = image->dlpi_phdr[i];
    if (segment.p_type != PT_LOAD) continue;
    if (wanted.address - image->dlpi_addr - segment.p_vaddr >= segment.p_memsz) continue;
    wanted.name = image->dlpi_name;
    return 1;
  }
  return 0;
}

constexpr std::size_t aligned(std::size_t size, std::size_t alignment) {
  return (size + alignment - 1) / alignment * alignment;
}

// Returns the state that the first mark among the notes from `note` to `end` leads to, or null. All marks of
// an image lead to the same state.
const ImageState* stateIn(const std::byte* note, const std::byte* end, std::size_t alignment) noexcept {
  auto left = static_cast<std::size_t>(end - note);
  while (left >= sizeof(ElfW(Nhdr))) {
    ElfW(Nhdr) header;
    std::memcpy(&header, note, sizeof header);
    const std::size_t descriptionAt = aligned(sizeof header + header.n_namesz, alignment);
    const std::size_t size = descriptionAt + header.n_descsz;
    // Notes that other tools have written may be cut off.
    if (size > left) break;
    std::int64_t distance = 0;
    if (header.n_type == kImageMarkType && header.n_namesz == sizeof kImageMarkName &&
        header.n_descsz == sizeof distance &&
        std::memcmp(note + sizeof header, kImageMarkName, sizeof kImageMarkName) == 0) {
      const std::byte* const description = note + descriptionAt;
      std::memcpy(&distance, description, sizeof distance);
      return reinterpret_cast<const ImageState*>(description + distance);
    }
    // The last note need not be padded.
    const std::size_t paddedSize = std::min(aligned(size, alignment), left);
    note += paddedSize;
    left -= paddedSize;
  }
  return nullptr;
}

// A callback. Returns 0 to go on with the next image, another value to stop.
int inspect(dl_phdr_info* image, std::size_t /*size*/, void* /*context*/) {
  for (std::size_t i = 0; i < image->dlpi_phnum; ++i) {
    const ElfW(Phdr)& segment = image->dlpi_phdr[i];
    if (segment.p_type != PT_NOTE) continue;
    const auto* notes = reinterpret_cast<const std::byte*>(image->dlpi_addr + segment.p_vaddr);
    const ImageState* const state = stateIn(notes, notes + segment.p_memsz, segment.p_align == 8 ? 8 : 4);
    if (state != nullptr && !state->isAnnounced) return 1;
  }
  return 0;
}

}  // namespace

void keepImage(const ImageState& state) noexcept {
  if (dlsym == nullptr) return;
  NamedImage image{.address = std::bit_cast<std::uintptr_t>(&state)};
  dl_iterate_phdr(&findImage, &image);
  // The name of the program itself is empty.
  if (image.name == nullptr || *image.name == '\0') return;
  using Open = void*(const char*, int);
  auto* const open = reinterpret_cast<Open*>(dlsym(RTLD_DEFAULT, "dlopen"));
  // The handle is never closed, so that no other handle is the last one.
  if (open != nullptr && open(image.name, RTLD_LAZY | RTLD_NOLOAD | RTLD_NODELETE) != nullptr) return;
  // The image is loaded already, so the loader refuses only if it has no memory.
  std::fprintf(stderr, "rt: \"%s\" cannot be kept from being unloaded; it must not be closed\n", image.name);
}

bool areAllImagesAnnounced() noexcept {
  return dl_iterate_phdr(&inspect, nullptr) == 0;
}

}  // namespace rt::detail
