// Compares writing an entry with the usual client library, which sends the same fields. In one case a socket
// takes every entry at once. In the other the machine's journald takes them.

#include <benchmark/benchmark.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <syslog.h>
#include <unistd.h>
#define SD_JOURNAL_SUPPRESS_LOCATION
#include <systemd/sd-journal.h>

#include <array>
#include <chrono>
#include <cstring>
#include <exception>
#include <filesystem>
#include <functional>
#include <memory>
#include <string>
#include <thread>

#include "Comparison.h"
#include "Runtime/SystemLog/SystemLog.h"
#include "tests/support/PrivateJournal.h"

namespace {

using namespace rt::literals;

constexpr const char* kSocket = "/run/systemd/journal/socket";
constexpr const char* kText =
    "-[Importer importFile:]: cannot read \"/srv/incoming/2026-07-31.csv\", line 1204";

// Receives the entries, in this process or by journald.
class Receiver {
 public:
  explicit Receiver(bool isDaemon) {
    if (isDaemon) {
      journal_ = std::make_unique<PrivateJournal>();
      journal_->start();
      return;
    }
    std::filesystem::create_directories("/run/systemd/journal");
    std::filesystem::remove(kSocket);
    descriptor_ = socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::strncpy(address.sun_path, kSocket, sizeof address.sun_path - 1);
    if (descriptor_ < 0 ||
        bind(descriptor_, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
      throw std::runtime_error("cannot bind the socket");
    }
  }
  Receiver(const Receiver&) = delete;
  Receiver& operator=(const Receiver&) = delete;
  ~Receiver() {
    if (descriptor_ < 0) return;
    close(descriptor_);
    std::filesystem::remove(kSocket);
  }

  // Takes an entry or gives journald time for it, so that there is room for the next. Returns false if this
  // process has received none.
  bool takeOne() {
    if (descriptor_ >= 0) return recv(descriptor_, buffer_.data(), buffer_.size(), MSG_DONTWAIT) > 0;
    std::this_thread::sleep_for(std::chrono::microseconds(200));
    return true;
  }

 private:
  std::unique_ptr<PrivateJournal> journal_;
  int descriptor_ = -1;
  std::array<char, 65536> buffer_{};
};

void measure(benchmark::State& state, bool isDaemon, void (*send)()) {
  try {
    if (!PrivateJournal::entered()) PrivateJournal::enter();
    Receiver receiver(isDaemon);
    send();
    receiver.takeOne();
    for (auto _ : state) {
      const auto begin = std::chrono::steady_clock::now();
      send();
      const std::chrono::duration<double> elapsed = std::chrono::steady_clock::now() - begin;
      state.SetIterationTime(elapsed.count());
      if (!receiver.takeOne()) {
        state.SkipWithError("an entry did not arrive");
        return;
      }
    }
  } catch (const std::exception& problem) {
    state.SkipWithError(problem.what());
  }
}

// Makes a new SystemLog for each entry, as a logger without a stored one does.
void sendOurs() {
  const rt::SystemLog log("com.example.Importer"_s, "files"_s);
  if (log.isEnabled(rt::SystemLog::Type::error)) log.write(rt::SystemLog::Type::error, kText);
}

void sendTheirs() {
  sd_journal_send("PRIORITY=%i", LOG_ERR, "TID=%i", gettid(), "SUBSYSTEM=%s", "com.example.Importer",
                  "CATEGORY=%s", "files", "MESSAGE=%s", kText, nullptr);
}

BENCHMARK_CAPTURE(measure, ours, false, sendOurs)->Name("SystemLog/entry/ours")->UseManualTime();
BENCHMARK_CAPTURE(measure, theirs, false, sendTheirs)
    ->Name("SystemLog/entry/sd_journal_send")
    ->UseManualTime();
BENCHMARK_CAPTURE(measure, oursToDaemon, true, sendOurs)
    ->Name("SystemLog/journald/ours")
    ->UseManualTime()
    ->Iterations(500);
BENCHMARK_CAPTURE(measure, theirsToDaemon, true, sendTheirs)
    ->Name("SystemLog/journald/sd_journal_send")
    ->UseManualTime()
    ->Iterations(500);

const Bound entryBound("SystemLog/entry", "sd_journal_send", 1.0);
const Bound daemonBound("SystemLog/journald", "sd_journal_send", 1.0);

}  // namespace
