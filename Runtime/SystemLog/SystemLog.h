#pragma once

/// Writes entries to the system's log, which the operator of the machine reads.
///
///     const rt::SystemLog log("com.example.host"_s, "network"_s);
///     if (log.isEnabled(rt::SystemLog::Type::error)) {
///       log.write(rt::SystemLog::Type::error, "no route to 192.0.2.1");
///     }
///
/// A `SystemLog` holds two strings. Making one opens nothing.
///
/// On Linux an entry goes to the journal. `journalctl SUBSYSTEM=com.example.host` shows it. Its fields are
/// MESSAGE, PRIORITY (debug 7, info 6, error 3, fault 2), SUBSYSTEM, CATEGORY, SYSLOG_IDENTIFIER (the
/// program's name), TID, and those that the caller gives. The journal receives entries of any size, with
/// every byte.
///
/// If no journal listens, the entry goes to the classic socket /dev/log. If nobody listens there either, it
/// goes to standard error. In both places control characters are escaped ("\n", "\x1b"). On standard error an
/// entry is one line, `name[pid] error: [subsystem:category] text`. On the classic socket a packet has 1024
/// bytes at most, as daemons expect, so a long entry becomes several packets.
///
/// A daemon that is alive but takes nothing blocks a caller for `kLongestWaitMilliseconds` at most. If no
/// other entry was taken during such a wait, later calls do not wait any more. They drop their entries at
/// once, until the daemon takes one again.
///
/// Dropped entries are counted. A report precedes the next entry that can be written. It is an error entry of
/// the subsystem "rt" with the number in the field DROPPED. `exit` tries once more to report a number that is
/// left. If that fails, it writes the report to standard error.
///
/// The first entry opens a socket, which the process keeps. It is closed on exec. The next entry after the
/// restart of a daemon finds the daemon again. In the child of a fork the log works, and counts from 0.
///
/// On macOS an entry goes to the unified log, which decides what is enabled and kept. `log show --info
/// --debug
/// --predicate 'subsystem == "com.example.host"'` shows it. That log cuts entries at about 1 KiB. So an entry
/// of more than 960 bytes becomes several, and no character is cut in two. A NUL becomes a space. Subsystem
/// and category are cut at 255 bytes. No entry is counted as dropped, since the log does not tell. In the
/// child of a fork, the log need not work.
///
/// Not for: messages to the user of a program; secrets, since entries are public.

#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>

#include "Runtime/Objects/String.h"

namespace rt {

class SystemLog {
 public:
  /// The type of an entry, in ascending order of severity.
  enum class Type : std::uint8_t { debug, info, error, fault };

  /// The longest time that one call of `write` waits for daemons.
  static constexpr int kLongestWaitMilliseconds = 250;

  /// A named value beside the text of an entry. Only the journal stores it.
  ///
  /// The name of the field in the journal is `name` with upper-case letters, and with '_' for all but letters
  /// and digits. "FIELD_" precedes it if it would begin otherwise than with a letter, or be the name of
  /// another field above. It is cut at 64 bytes. A field called TID replaces the calling thread's.
  struct Field {
    std::string_view name;
    std::string_view value;
  };

  /// The number of fields that an entry may have. It is written without those beyond.
  static constexpr std::size_t kMostFields = 32;

  /// Makes a log for the entries of `category` in `subsystem`. Null counts as empty.
  SystemLog(String subsystem, String category) noexcept;

  /// Returns whether entries of `type` are enabled. Always true on Linux, where the journal's own setting
  /// MaxLevelStore= decides what is stored. Preserves `errno`.
  bool isEnabled(Type type) const noexcept;

  /// Writes the entry `text`, which should be UTF-8, with `fields`. If a journal listens, or the unified log,
  /// takes no lock of its own and allocates nothing itself. Preserves `errno`. May also be called while the
  /// program is being loaded, and after `main`. Threads: thread-safe. Threads do not wait for each other's
  /// entries. Errors: drops and counts an entry that cannot be written, as described above.
  void write(Type type, std::string_view text, std::span<const Field> fields = {}) const noexcept;

  /// Returns how many entries of this process were dropped so far, reported or not. Threads: thread-safe.
  static std::uint64_t droppedCount() noexcept;

 private:
  String subsystem_;
  String category_;
};

}  // namespace rt
