#pragma once

/// How urgent the work of a queue is.
///
/// On Linux, a thread that runs work of `kUtility` is nicer than the process by 5, and any other thread as
/// nice as the process. No thread is less nice: that would take a privilege, and would put the library before
/// its host. A thread that a nicer one had to start may stay as nice for want of that privilege. It does the
/// work that waits at that moment, and then ends. On macOS these are the system's classes of the same names.

#include <cstdint>

namespace rt {

enum class QualityOfService : std::uint8_t {
  /// What a user sees or touches right now.
  kUserInteractive,
  /// Nothing was said.
  kDefault,
  /// What goes on for a while and nobody waits for.
  kUtility,
};

}  // namespace rt
