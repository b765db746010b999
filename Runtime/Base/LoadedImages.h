#pragma once

// Tells what parts of the program have been loaded. The executable and each shared library is an image. For
// the runtime itself, not for its users.
//
// The system loads all images of a program. Then it calls the load-time functions of each image, libraries
// before the images that use them. One of these functions announces what the image has: classes, protocols,
// class methods and load hooks.
//
// An image that announces something bears a mark. The mark is visible before any function has been called.
// Load hooks run when all images with a mark have announced what they have.
//
// An image that uses a class announces it, too, since each image may have a record of its own. A literal is
// an object. So an image with a literal announces the class of strings.

namespace rt::detail {

// The state that a mark leads to. Each system defines its own.
struct ImageState;

// Images announce what they have at constructor priority 102, on macOS also at 101. 101 is the first priority
// that is free to use. Static objects without a priority are initialised after both.

// Keeps the image with the mark `state` loaded as long as the process lives. What the image has announced is
// referred to for ever, and so may be its literals. Does nothing for the program itself.
//
// Called once for an image, while it is loaded. Looks through the loaded images once. Opens no file and
// allocates nothing. Writes a line on standard error if the system refuses.
void keepImage(const ImageState& state) noexcept;

// Returns whether every image with a mark has announced what it has. Called while images are loaded, so that
// no image comes or goes meanwhile.
bool areAllImagesAnnounced() noexcept;

// Runs the load hooks announced so far, if every image has announced what it has. Each image calls this
// after its announcement. Defined where load hooks are kept (Runtime/Objects/LoadHook.cpp).
void runLoadHooksWhenComplete() noexcept;

}  // namespace rt::detail

#ifdef __APPLE__
#include "Runtime/Base/Darwin/ImageMark.h"
#else
#include "Runtime/Base/Linux/ImageMark.h"
#endif
