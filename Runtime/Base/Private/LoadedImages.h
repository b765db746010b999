#pragma once

/// What of the program has been loaded: the executable and each shared library is an image. Inside of
/// the runtime; nothing here is for its users.
///
/// The system loads all images of a program, then calls the functions that each has for that, libraries
/// before those that use them. One of these functions announces what the image has: classes, protocols, class
/// methods and load hooks. Such an image bears a mark, which shows before any function has been called. Load
/// hooks run when all images with a mark have announced what they have.
///
/// Whoever uses a class announces it too, since each image may have a record of its own. A literal is an
/// object, so an image with a literal announces the class of strings.

namespace rt::detail {

/// What a mark leads to. Defined by system.
struct ImageState;

// This happens at priority 102 of such functions, on macOS also at 101, the first that is free to use. What
// the compiler arranges for static objects without a priority comes after both.

/// Keeps the image that has `state`, its mark, from being unloaded as long as the process lives: what it has
/// announced is referred to for ever, and so may be its literals. Takes one look at the images that are
/// loaded; opens no file and allocates nothing. Does nothing for the program itself. Where the system
/// refuses, a line on standard error says so. Called once for an image, while it is loaded.
void keepImage(const ImageState& state) noexcept;

/// Whether every image that bears a mark has announced what it has. Called while images are loaded, so
/// that none comes or goes meanwhile.
bool areAllImagesAnnounced() noexcept;

/// Runs the load hooks announced so far if every image has announced what it has. Called by each image
/// when it is done. Defined where load hooks are kept (Runtime/Objects/LoadHook.cpp).
void runLoadHooksWhenComplete() noexcept;

}  // namespace rt::detail

#ifdef __APPLE__
#include "Runtime/Base/Private/Darwin/ImageMark.h"
#else
#include "Runtime/Base/Private/Linux/ImageMark.h"
#endif
