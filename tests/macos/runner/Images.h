#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "Image.h"

/// What `main` and the initialisers are called with.
struct Arguments {
  int count = 0;
  char** values = nullptr;
};

/// The images of the process, in the order in which they were loaded. The first is the program; the second is
/// the runner's own copy of the unwinder, which on macOS is a part of libSystem.
///
/// Threads: thread-safe, unless said otherwise. Looking at the images takes no lock, so an exception may be
/// thrown in the child of a fork.
namespace Images {

/// The most images that a process may load.
constexpr std::size_t kMost = 1024;

/// Loads the program and its libraries, initialises them and calls `main`. Returns what `main` does.
///
/// Before anything of them runs, refuses the program if an image imports a name that no image and no shim
/// has. The message has all such names.
int run(const std::string& path, FileBytes program, FileBytes unwinder, const Arguments& arguments);

/// The program's arguments.
Arguments& arguments();

/// Bits of the second argument of `open`, with the values that macOS gives them.
constexpr int kOnlyIfLoaded = 0x10;
constexpr int kNeverUnload = 0x80;

/// Opens a library or bundle as `dlopen` does. Returns null if there is no such file, or if it must be loaded
/// already and is not.
const Image* open(const std::string& path, int flags);

/// Takes back one `open`. The last one of an image runs its destructors and unloads it, unless the program or
/// another image needs it.
void close(const Image& image);

/// Calls `function` with the header and the slide of each image that will be unloaded, before that.
void callBeforeUnload(void (*function)(const void* header, std::intptr_t slide));

std::size_t count();
/// Returns null for an image that was unloaded, and for a number that is too great.
const Image* at(std::size_t number);
const Image* containing(const void* address);
const Image* withHeader(const void* header);

/// Looks the name up in all images and then in the shims, as an image does that asks for any definition. The
/// name begins with C's underscore. Returns null if it is nowhere.
const void* lookUp(std::string_view name);
/// Looks the name up in the image and in the libraries that it needs.
const void* lookUpIn(const Image& image, std::string_view name);

}  // namespace Images
