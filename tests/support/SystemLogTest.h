#pragma once

// What the tests of the system log share: a private journal, a classic daemon's socket, and what was dropped.

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

// Why there is no private journal; empty when there is one.
inline std::string refusal;

inline const rt::SystemLog& testLog() {
  using namespace rt::literals;
  static const rt::SystemLog log("com.example.test"_s, "unit"_s);
  return log;
}

// The descriptors of this process that are sockets.
inline std::vector<int> sockets() {
  std::vector<int> found;
  for (const std::filesystem::directory_entry& entry : std::filesystem::directory_iterator("/proc/self/fd")) {
    const int descriptor = std::stoi(entry.path().filename());
    struct stat status{};
    if (fstat(descriptor, &status) == 0 && S_ISSOCK(status.st_mode)) found.push_back(descriptor);
  }
  return found;
}

// Makes the log start as in a new process.
inline void closeSockets() {
  for (const int descriptor : sockets()) close(descriptor);
}

// How many entries had been dropped when the test began.
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

// How many dropped entries the journal tells of.
inline std::uint64_t reportedDropped(const PrivateJournal& journal) {
  std::uint64_t sum = 0;
  for (PrivateJournal::Entry& entry : journal.entries("SUBSYSTEM=rt")) sum += std::stoull(entry["DROPPED"]);
  return sum;
}

// A classic daemon's socket.
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

  // The packets that have come.
  std::vector<std::string> packets() {
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
    // Made now: the child of a fork would wait for ever for a thread of its parent's that is making it.
    testLog();
    // What earlier cases left untold is told now.
    if (rt::SystemLog::droppedCount() != 0) {
      const StandardErrorPipe standardError;
      testLog().write(rt::SystemLog::Type::info, "ended");
    }
    droppedBefore = rt::SystemLog::droppedCount();
  }
};
