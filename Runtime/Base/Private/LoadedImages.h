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
//
// Each source file lists the announcements that it mentions. An initialiser of the image walks the list. One
// initialiser for each class in each source file would make hundreds of them.

namespace rt::detail {

// The state that a mark leads to. Each image has its own.
struct ImageState {
  bool isAnnounced = false;
};

// An entry of an image's list of announcements. It is called like a function. Each system defines its own.
class Announcement;

// Makes the announcements of the image that has `state`, from `begin` to `end`, and notes that. Runs the load
// hooks if the image was the last one. A second call does nothing.
void announce(ImageState& state, const Announcement* begin, const Announcement* end) noexcept;

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

// The header below also defines the image's `imageState`. It has the initialiser that calls the first
// function above with that state and the image's list. Mentioning `AnnouncedOnLoading<entry>::run` puts it
// into the list. It calls `announce(entry)`.
#ifdef __APPLE__
#include "Runtime/Base/Private/Darwin/ImageMark.h"
#else
#include "Runtime/Base/Private/Linux/ImageMark.h"
#endif
