#pragma once

/// The calling thread: its name and its handle.
///
///     rt::Thread::setCurrentName("Importer"_s);
///     rt::Thread::currentName();        // "Importer"
///     rt::Thread::currentHandle();      // as "%p" prints it
///
/// Not for: starting threads (std::thread); telling threads apart quickly (std::this_thread::get_id).

#include "Runtime/Objects/String.h"

namespace rt::Thread {

/// Returns the last name that `setCurrentName` gave to the calling thread, or null. It only reads a variable.
///
/// On macOS the first call on a thread without such a name takes over the system's name of the thread. On
/// Linux the system's name does not count, since a thread inherits it from its creator.
///
/// A thread releases its name when it ends. Code that runs after that, such as destructors of keys of the
/// thread library, gets null.
/// Errors: throws std::bad_alloc on macOS, at the first call on a thread.
String currentName();

/// Names the calling thread. Null removes its name. The system shows the name too. It shows the first 15
/// bytes at most, on macOS 63, without an incomplete character at the end.
/// Errors: throws std::bad_alloc at the first name of a thread. The thread has no name then.
void setCurrentName(const String& name);

/// Returns the calling thread's handle in the system's thread library (pthread_self). Never null, and the
/// same as long as the thread lives.
const void* currentHandle() noexcept;

}  // namespace rt::Thread
