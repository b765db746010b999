#pragma once

/// What of the program has been loaded: the executable and each shared library is an image. Inside of
/// the runtime; nothing here is for its users.
///
/// The system loads all images of a program, then calls the functions that each has for that, libraries
/// before those that use them. Two rounds of such functions matter here: in the first an image announces
/// its classes, protocols, class methods and load hooks; in the second it says that it has done so, by
/// `announceImage`, of which each image that announces anything has a copy. An image bears a mark that
/// shows, before any of its functions has been called, that it will announce something.

namespace rt::detail {

// The rounds are priorities of [[gnu::constructor]]: 101, the first that is free to use, and 102. What the
// compiler arranges for static objects comes after both.

/// Whether every image that bears a mark has announced what it has. Called while images are loaded, so
/// that none comes or goes meanwhile.
bool areAllImagesAnnounced() noexcept;

/// Runs the load hooks announced so far if every image has announced what it has. Called by each image
/// when it is done.
void runLoadHooksWhenComplete() noexcept;

}  // namespace rt::detail

#ifdef __APPLE__
#include "Runtime/Darwin/ImageMark.h"
#else
#include "Runtime/Linux/ImageMark.h"
#endif
