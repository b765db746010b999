#pragma once

/// The system's log: entries that the operator of the machine reads.
///
///     const rt::SystemLog log("com.example.host"_s, "network"_s);
///     if (log.isEnabled(rt::SystemLog::Type::error)) {
///       log.write(rt::SystemLog::Type::error, "no route to 192.0.2.1");
///     }
///
/// A handle is two strings; making one opens nothing and costs nothing to speak of.
///
/// On Linux an entry goes to the journal (read it with `journalctl SUBSYSTEM=com.example.host`) with the
/// fields MESSAGE, PRIORITY (debug 7, info 6, error 3, fault 2), SUBSYSTEM, CATEGORY, SYSLOG_IDENTIFIER
/// (the program's name) and TID. Entries of any size arrive whole, with every byte. Where no journal
/// listens it goes to the classic socket /dev/log, and where nobody listens there either to standard
/// error; there an entry is one line, `name[pid] error: [subsystem:category] text`, and control characters
/// are written out ("\n", "\x1b"). A packet on the classic socket has 1024 bytes at most, as daemons
/// expect, so that a long entry becomes several.
///
/// A daemon that is alive but takes nothing holds a caller up for `kLongestWaitMilliseconds` at most. Once
/// one has waited in vain, and nobody else's entry was taken meanwhile, entries are dropped at once until the
/// daemon takes one again. What was dropped is counted, and the count is written in the place of what is
/// missing: an error entry of subsystem "rt" with the number in the field DROPPED. What is left to tell when
/// the program ends by `exit` is tried once more then, and otherwise goes to standard error.
///
/// The first entry opens a socket, closed on exec, which the process keeps. A daemon that is started anew
/// is found again with the next entry. The child of a fork logs on, and begins to count anew.
///
/// On macOS an entry goes to the unified log, which decides what is enabled and what is kept.
///
/// Not for: text that nobody but the user of a program reads; secrets, since entries are public.

#include <cstdint>
#include <string_view>

#include "Runtime/Objects/String.h"

namespace rt {

class SystemLog {
 public:
  /// What an entry is, in the order of how bad it is.
  enum class Type : std::uint8_t { debug, info, error, fault };

  /// The longest that `write` waits for a daemon, all in all.
  static constexpr int kLongestWaitMilliseconds = 250;

  /// A handle for the entries of `category` in `subsystem`; null counts as empty.
  SystemLog(String subsystem, String category) noexcept;

  /// Whether entries of `type` are kept. On Linux always: the journal has its own say (MaxLevelStore=).
  bool isEnabled(Type type) const noexcept;

  /// Writes the entry `text`, bytes that should be UTF-8. Any thread may call it, at any time, also while
  /// the program is being loaded or after `main`; threads do not wait for each other. Where a journal
  /// listens it takes no lock and allocates nothing. Leaves `errno` alone. See above for what happens to an
  /// entry that cannot be written.
  void write(Type type, std::string_view text) const noexcept;

  /// How many entries of the whole process were dropped so far, reported or not. Any thread may call it.
  static std::uint64_t droppedCount() noexcept;

 private:
  String subsystem_;
  String category_;
};

}  // namespace rt
