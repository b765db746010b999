#pragma once

/// How urgent the work of a queue is, from what somebody waits for to what nobody will miss.
///
/// What the system makes of it: on Linux the threads that run the work are nicer than the process by 0
/// (the first three), 5 (utility) or 10 (background), and by a third of the relative priority below 0
/// more. They are never less nice than the process: that would take a privilege, and would put the
/// library before its host. A thread that a nicer one had to start may stay as nice for want of that
/// privilege; it does what waits at that moment, and no more. On macOS they are the system's classes of the
/// same names.

#include <cstdint>

namespace rt {

enum class QualityOfService : std::uint8_t {
  /// What a user sees or touches right now.
  kUserInteractive,
  /// What a user has asked for and waits for.
  kUserInitiated,
  /// Nothing was said.
  kDefault,
  /// What goes on for a while and nobody waits for.
  kUtility,
  /// What nobody knows of.
  kBackground,
};

}  // namespace rt
