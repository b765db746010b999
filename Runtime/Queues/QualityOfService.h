#pragma once

/// How urgent the work of a queue is.
///
/// On Linux, a thread that runs work of `kUtility` is nicer than the process by 5. All other threads are as
/// nice as the process. No thread is less nice than the process: that takes a privilege, and would put the
/// library before its host. A thread that a nicer one has started may lack the privilege to become less
/// nice. It then does the work that waits at that moment, and ends.
///
/// On macOS a thread that runs work of `kUtility` has the system's class of that name. All other threads of
/// queues have the class "default".

#include <cstdint>

namespace rt {

enum class QualityOfService : std::uint8_t {
  /// Work whose result a user sees or touches right now.
  kUserInteractive,
  /// The default.
  kDefault,
  /// Work that goes on for a while and that nobody waits for.
  kUtility,
};

}  // namespace rt
