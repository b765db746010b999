#pragma once

#include <sys/types.h>

#include <cstdint>
#include <map>
#include <string>
#include <vector>

/// Runs the machine's journald as a private journal that hears only this process and its children. It runs in
/// a private root with an empty /run. That root has its own /dev, so that a test may listen at /dev/log.
///
///     PrivateJournal::enter();
///     PrivateJournal journal;
///     journal.start();
///     ... log ...
///     for (PrivateJournal::Entry& entry : journal.entries("SUBSYSTEM=com.example")) entry["MESSAGE"] ...
///
/// Linux only. The destructor stops journald.
///
/// Errors: if the machine does not allow an operation, it throws std::system_error or std::runtime_error with
/// the reason.
class PrivateJournal {
 public:
  /// The stored fields of an entry.
  using Entry = std::map<std::string, std::string>;

  enum class Sockets : std::uint8_t {
    /// journald makes its own socket, and a new one at each start. When it stops, unread entries are lost.
    ownedByDaemon,
    /// This object owns the socket, as the service manager does in a running system. The socket outlives
    /// journald, and entries wait in it until journald starts again.
    ownedByManager,
  };

  /// Moves this process into a private root with an empty /run and its own /dev. Precondition: the process
  /// has one thread.
  static void enter();

  /// Returns whether `enter` succeeded in this process.
  static bool entered();

  explicit PrivateJournal(Sockets sockets = Sockets::ownedByDaemon);
  PrivateJournal(const PrivateJournal&) = delete;
  PrivateJournal& operator=(const PrivateJournal&) = delete;
  ~PrivateJournal();

  /// Starts journald and waits until it listens. Precondition: journald is not running.
  void start();

  /// Stops journald and waits until it has ended. Before it ends, journald stores the entries that it has
  /// received.
  void stop();

  /// Suspends and resumes journald. Precondition of `suspend`: journald is running.
  void suspend() const;
  void resume() const;

  /// Returns all matching entries that have been sent so far, in order of arrival.
  std::vector<Entry> entries(const std::string& match) const;

 private:
  int listeningSocket_ = -1;
  pid_t daemon_ = 0;
};
