// <dlfcn.h>, <mach-o/dyld.h> and <mach-o/getsect.h>

#include <sys/types.h>
#include <unistd.h>

#include <array>
#include <climits>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <string>
#include <string_view>

#include "tests/macos/runner/Images.h"
#include "tests/macos/runner/Shims.h"
#include "tests/macos/runner/ThreadLocals.h"

namespace {

// Special values of handles: RTLD_DEFAULT, RTLD_SELF, RTLD_MAIN_ONLY. RTLD_NEXT is -1.
const void* const kDefault = reinterpret_cast<const void*>(std::intptr_t{-2});
const void* const kMainOnly = reinterpret_cast<const void*>(std::intptr_t{-5});

// A handle for the one framework that has shims.
constexpr std::string_view kCoreFoundation =
    "/System/Library/Frameworks/CoreFoundation.framework/CoreFoundation";
constexpr char kFramework = 0;

thread_local std::string problem;
thread_local bool hasProblem = false;

void* failWith(const std::string& text) {
  problem = text;
  hasProblem = true;
  return nullptr;
}

const void* openImage(const char* path, int flags) {
  if (path == nullptr) return kDefault;
  if (path == kCoreFoundation) return &kFramework;
  const std::string_view name = path;
  if (name.starts_with("/System/") || name.starts_with("/usr/lib/")) {
    // An image that needs another library of the system than libSystem is not run, so no such library is
    // loaded.
    if ((flags & Images::kOnlyIfLoaded) != 0) return failWith(std::string(name) + " is not loaded");
    refuse("%s is opened, for which there are no shims", path);
  }
  const Image* image = Images::open(path, flags);
  return image == nullptr ? failWith("dlopen(" + std::string(path) + "): no such file") : image;
}

int closeImage(const void* handle) {
  if (handle != kDefault && handle != &kFramework) Images::close(*static_cast<const Image*>(handle));
  return 0;
}

const void* find(const void* handle, const char* name) {
  const std::string symbol = "_" + std::string(name);
  const auto number = reinterpret_cast<std::intptr_t>(handle);
  const void* found = nullptr;
  if (handle == &kFramework) {
    found = shimNamed(name);
    if (found == nullptr) refuse("%s of CoreFoundation has no shim", name);
  } else if (handle == kDefault) {
    found = Images::lookUp(symbol);
  } else if (handle == kMainOnly) {
    found = Images::lookUpIn(*Images::at(0), symbol);
  } else if (number < 0 && number > -16) {
    refuse("dlsym is called with the handle %td", number);
  } else {
    found = Images::lookUpIn(*static_cast<const Image*>(handle), symbol);
  }
  return found == nullptr ? failWith("dlsym(" + std::string(name) + "): symbol not found") : found;
}

const char* error() {
  return std::exchange(hasProblem, false) ? problem.c_str() : nullptr;
}

struct Information {
  const char* path;
  const void* header;
  const char* symbol;
  const void* address;
};

int describe(const void* address, Information* information) {
  const Image* image = Images::containing(address);
  if (image == nullptr) return 0;
  const auto symbol = image->symbolBefore(reinterpret_cast<std::uint64_t>(address));
  *information = {.path = image->path().c_str(),
                  .header = image->header(),
                  .symbol = symbol ? symbol->name : nullptr,
                  .address = symbol ? reinterpret_cast<const void*>(symbol->address) : nullptr};
  return 1;
}

// ---- Images ----

// Numbers of unloaded images are not given to others. An image of no name and no header stands there.
std::uint32_t imageCount() {
  return static_cast<std::uint32_t>(Images::count());
}

const void* imageHeader(std::uint32_t number) {
  const Image* const image = Images::at(number);
  return image == nullptr ? nullptr : image->header();
}

const char* imageName(std::uint32_t number) {
  const Image* const image = Images::at(number);
  return image == nullptr ? nullptr : image->path().c_str();
}

std::intptr_t imageSlide(std::uint32_t number) {
  const Image* const image = Images::at(number);
  return image == nullptr ? 0 : static_cast<std::intptr_t>(image->slide());
}

void* sectionOf(const void* header, const char* segment, const char* name, unsigned long* size) {
  const Image* const image = Images::withHeader(header);
  const std::span<std::byte> section =
      image == nullptr ? std::span<std::byte>() : image->section(segment, name);
  *size = section.size();
  return section.data();
}

// What the unwinder asks for: the tables of the image that has the address.
struct UnwindSections {
  const void* header;
  const void* dwarf;
  std::uintptr_t dwarfSize;
  const void* compact;
  std::uintptr_t compactSize;
};

bool findUnwindSections(const void* address, UnwindSections* sections) {
  const Image* const image = Images::containing(address);
  if (image == nullptr) return false;
  const std::span<std::byte> dwarf = image->section("__TEXT", "__eh_frame");
  const std::span<std::byte> compact = image->section("__TEXT", "__unwind_info");
  *sections = {.header = image->header(),
               .dwarf = dwarf.data(),
               .dwarfSize = dwarf.size(),
               .compact = compact.data(),
               .compactSize = compact.size()};
  return true;
}

int executablePath(char* buffer, std::uint32_t* size) {
  const std::string& path = Images::at(0)->path();
  if (path.size() >= *size) {
    *size = static_cast<std::uint32_t>(path.size() + 1);
    return -1;
  }
  std::memcpy(buffer, path.c_str(), path.size() + 1);
  return 0;
}

char*** argumentValues() {
  return &Images::arguments().values;
}

int* argumentCount() {
  return &Images::arguments().count;
}

char*** environment() {
  return &environ;
}

[[noreturn]] void bindLazily() {
  refuse("a function is bound when it is called, although all were bound at the start");
}

}  // namespace

shims::Table shims::dlfcn() {
  static const Shim table[] = {
      shim("dlopen", &openImage),
      shim("dlclose", &closeImage),
      shim("dlsym", &find),
      shim("dlerror", &error),
      shim("dladdr", &describe),
      shim("_dyld_image_count", &imageCount),
      shim("_dyld_get_image_header", &imageHeader),
      shim("_dyld_get_image_name", &imageName),
      shim("_dyld_get_image_vmaddr_slide", &imageSlide),
      shim("_dyld_register_func_for_remove_image", &Images::callBeforeUnload),
      shim("_dyld_find_unwind_sections", &findUnwindSections),
      shim("getsectiondata", &sectionOf),
      shim("_NSGetExecutablePath", &executablePath),
      shim("_NSGetArgv", &argumentValues),
      shim("_NSGetArgc", &argumentCount),
      shim("_NSGetEnviron", &environment),
      {"_tlv_bootstrap", threadLocalBootstrap()},
      shim("dyld_stub_binder", &bindLazily),
  };
  return table;
}
