#pragma once

/// The calling thread: its name and its handle.
///
///     rt::Thread::setCurrentName("Importer"_s);
///     rt::Thread::currentName();        // "Importer"
///     rt::Thread::currentHandle();      // as "%p" prints it
///
/// Not for: starting threads (std::thread); telling threads apart quickly
/// (Runtime/Locks/Private/ThreadIdentifier.h).

#include "Runtime/Objects/String.h"

namespace rt::Thread {

/// The calling thread's name; null when it has none. That is the last one given with `setCurrentName`. On
/// macOS a thread that was never given one there is looked at once, the first time it is asked, for a name
/// that the system knows. On Linux what the system knows does not count: a thread bears its creator's name
/// there until it is given another. Costs a look at a variable. Null in what the thread still runs after
/// its name was given up, such as destructors of keys of the thread library. Throws std::bad_alloc on macOS,
/// at the first call on a thread.
String currentName();

/// Names the calling thread; null takes its name away. The system shows the name too, on Linux the first
/// 15 bytes of it, less where they would end within a character. Throws
/// std::bad_alloc at the first name of a thread, which then has none.
void setCurrentName(const String& name);

/// The calling thread as the system's thread library knows it (pthread_self); never null, and the same as
/// long as the thread lives.
const void* currentHandle() noexcept;

}  // namespace rt::Thread
