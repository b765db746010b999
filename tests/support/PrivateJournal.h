#pragma once

#include <sys/types.h>

#include <cstdint>
#include <map>
#include <string>
#include <vector>

/// A journal of one's own: the machine's journald, run in a private root with an empty /run and a /dev in
/// which anybody may listen at /dev/log, so that it hears nobody but this process and its children.
///
///     PrivateJournal::enter();
///     PrivateJournal journal;
///     journal.start();
///     ... log ...
///     for (PrivateJournal::Entry& entry : journal.entries("SUBSYSTEM=com.example")) entry["MESSAGE"] ...
///
/// Linux only. Every operation throws std::system_error or std::runtime_error, with the reason, where the
/// machine does not let it happen. Stopped with the object.
class PrivateJournal {
 public:
  /// An entry's fields, as the journal has stored them.
  using Entry = std::map<std::string, std::string>;

  enum class Sockets : std::uint8_t {
    /// journald makes its socket, and a new one when it is started anew: entries that it has not read
    /// when it stops are lost.
    ownedByDaemon,
    /// The socket is this object's, as it is the service manager's in a running system, and outlives the
    /// daemon: entries wait in it until journald is there again.
    ownedByManager,
  };

  /// Moves this process, which must have one thread, into a private root with an empty /run and a /dev of
  /// its own.
  static void enter();

  /// Whether `enter` succeeded in this process.
  static bool entered();

  explicit PrivateJournal(Sockets sockets = Sockets::ownedByDaemon);
  PrivateJournal(const PrivateJournal&) = delete;
  PrivateJournal& operator=(const PrivateJournal&) = delete;
  ~PrivateJournal();

  /// Starts journald and returns when it listens. Not while it runs.
  void start();

  /// Ends journald, when it has stored what it was sent, and waits until it is gone.
  void stop();

  /// Keeps journald, which runs, from running, and lets it go on.
  void suspend() const;
  void resume() const;

  /// The entries that match, of all that have been sent until now, in the order of their arrival.
  std::vector<Entry> entries(const std::string& match) const;

 private:
  int listeningSocket_ = -1;
  pid_t daemon_ = 0;
};
