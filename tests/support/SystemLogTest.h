#pragma once

// A fixture and helpers for the tests of the system log. They read a private journal, play a classic syslog
// daemon, and count dropped entries.

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <filesystem>
#include <string>
#include <vector>

#include "Runtime/SystemLog/SystemLog.h"
#include "tests/support/PrivateJournal.h"
#include "tests/support/StandardErrorPipe.h"

inline constexpr const char* kJournalSocket = "/run/systemd/journal/socket";
inline constexpr const char* kClassicSocket = "/dev/log";

// The reason why there is no private journal. Empty if there is one.
inline std::string refusal;

inline const rt::SystemLog& testLog() {
  using namespace rt::literals;
  static const rt::SystemLog log("com.example.test"_s, "unit"_s);
  return log;
}

// Returns the descriptors of this process that are sockets.
inline std::vector<int> sockets() {
  std::vector<int> found;
  for (const std::filesystem::directory_entry& entry : std::filesystem::directory_iterator("/proc/self/fd")) {
    const int descriptor = std::stoi(entry.path().filename());
    struct stat status{};
    if (fstat(descriptor, &status) == 0 && S_ISSOCK(status.st_mode)) found.push_back(descriptor);
  }
  return found;
}

// Closes all sockets, so that the log starts as in a new process.
inline void closeSockets() {
  for (const int descriptor : sockets()) close(descriptor);
}

// The number of entries that had been dropped when the test began.
inline std::uint64_t droppedBefore = 0;

inline std::uint64_t dropped() {
  return rt::SystemLog::droppedCount() - droppedBefore;
}

inline std::vector<PrivateJournal::Entry> testEntries(const PrivateJournal& journal) {
  return journal.entries("SUBSYSTEM=com.example.test");
}

inline std::vector<std::string> messages(const PrivateJournal& journal) {
  std::vector<std::string> all;
  for (PrivateJournal::Entry& entry : testEntries(journal)) all.push_back(entry["MESSAGE"]);
  return all;
}

// Returns how many dropped entries the journal reports.
inline std::uint64_t reportedDropped(const PrivateJournal& journal) {
  std::uint64_t sum = 0;
  for (PrivateJournal::Entry& entry : journal.entries("SUBSYSTEM=rt")) sum += std::stoull(entry["DROPPED"]);
  return sum;
}

// The socket of a classic syslog daemon.
class ClassicSocket {
 public:
  ClassicSocket() : descriptor_(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0)) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::strncpy(address.sun_path, kClassicSocket, sizeof address.sun_path - 1);
    EXPECT_EQ(bind(descriptor_, reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
  }
  ClassicSocket(const ClassicSocket&) = delete;
  ClassicSocket& operator=(const ClassicSocket&) = delete;
  ~ClassicSocket() {
    close(descriptor_);
    std::filesystem::remove(kClassicSocket);
  }

  // Reads and returns the packets that have arrived.
  std::vector<std::string> packets() const {
    std::vector<std::string> all;
    std::string buffer(65536, '\0');
    for (ssize_t length; (length = recv(descriptor_, buffer.data(), buffer.size(), MSG_DONTWAIT)) >= 0;) {
      all.emplace_back(buffer, 0, static_cast<std::size_t>(length));
    }
    return all;
  }

 private:
  int descriptor_;
};

class SystemLogTest : public testing::Test {
 protected:
  void SetUp() override {
    if (!PrivateJournal::entered()) GTEST_SKIP() << refusal;
    std::filesystem::remove(kClassicSocket);
    // This constructs the log before any fork. Otherwise a child could wait for ever for a thread of its
    // parent that was constructing it.
    testLog();
    // This makes the log report the entries that earlier cases dropped.
    if (rt::SystemLog::droppedCount() != 0) {
      const StandardErrorPipe standardError;
      testLog().write(rt::SystemLog::Type::info, "ended");
    }
    droppedBefore = rt::SystemLog::droppedCount();
  }
};
