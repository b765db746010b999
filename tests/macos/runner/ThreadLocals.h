#pragma once

#include "Image.h"

/// Prepares the image's thread-local variables. Call it after the image was fixed up and before it is
/// protected.
///
/// On macOS, code calls the function in a variable's descriptor to get the variable's address in the calling
/// thread. The first call of a thread for an image allocates all of the image's variables. They are freed
/// when the thread ends, but not when the process does.
void prepareThreadLocals(const Image& image);

/// The function that a linker puts into descriptors until `prepareThreadLocals` replaces it. Ends the
/// process.
const void* threadLocalBootstrap();
