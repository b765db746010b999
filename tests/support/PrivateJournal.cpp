#include "tests/support/PrivateJournal.h"

#include <fcntl.h>
#include <spawn.h>
#include <sys/mount.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <exception>
#include <filesystem>
#include <fstream>
#include <stdexcept>
#include <string_view>
#include <system_error>

#include "tests/support/PrivateRoot.h"
#include "tests/support/Process.h"

namespace {

namespace fs = std::filesystem;

constexpr const char* kDaemon = "/lib/systemd/systemd-journald";
constexpr const char* kSocket = "/run/systemd/journal/socket";
constexpr const char* kNotifySocket = "/run/journal-notify";

bool hasEntered = false;

void require(bool succeeded, const std::string& what) {
  if (!succeeded) throw std::system_error(errno, std::generic_category(), what);
}

// Mounts an empty tmpfs on /dev and binds the machine's devices into it, except /dev/log.
void enterPrivateDevices() {
  const fs::path devices = "/run/devices";
  fs::create_directory(devices);
  require(mount("/dev", devices.c_str(), nullptr, MS_BIND | MS_REC, nullptr) == 0, "cannot bind /dev");
  require(mount("tmpfs", "/dev", "tmpfs", 0, "mode=0755") == 0, "cannot mount a tmpfs on /dev");
  for (const fs::directory_entry& entry : fs::directory_iterator(devices)) {
    const fs::path place = "/dev" / entry.path().filename();
    if (place == "/dev/log") continue;
    if (entry.is_symlink()) {
      fs::copy_symlink(entry.path(), place);
      continue;
    }
    if (entry.is_directory()) {
      fs::create_directory(place);
    } else {
      std::ofstream{place};
    }
    require(mount(entry.path().c_str(), place.c_str(), nullptr, MS_BIND | MS_REC, nullptr) == 0,
            "cannot bind " + entry.path().string());
  }
  require(umount2(devices.c_str(), MNT_DETACH) == 0, "cannot unmount " + devices.string());
}

// Returns a datagram socket bound to `path`. Precondition: `path` does not exist.
int listenAt(const char* path) {
  const int descriptor = socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
  require(descriptor >= 0, "socket");
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  std::strncpy(address.sun_path, path, sizeof address.sun_path - 1);
  require(bind(descriptor, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0, path);
  return descriptor;
}

// Waits until the service notifies its manager that it is ready.
void awaitReady(int notifySocket) {
  const timeval wait{60, 0};
  require(setsockopt(notifySocket, SOL_SOCKET, SO_RCVTIMEO, &wait, sizeof wait) == 0, "setsockopt");
  std::array<char, 4096> message{};
  for (;;) {
    const ssize_t length = recv(notifySocket, message.data(), message.size(), 0);
    require(length >= 0, "journald does not say that it is ready");
    const std::string_view text(message.data(), static_cast<std::size_t>(length));
    if (text.find("READY=1") != std::string_view::npos) return;
  }
}

// Removes the first field from the output of `journalctl --output=export` and returns it.
std::pair<std::string, std::string> takeField(std::string_view& text) {
  const std::size_t lineEnd = text.find('\n');
  const std::string_view line = text.substr(0, lineEnd);
  text.remove_prefix(lineEnd + 1);
  if (const std::size_t equals = line.find('='); equals != std::string_view::npos) {
    return {std::string(line.substr(0, equals)), std::string(line.substr(equals + 1))};
  }
  // A value that is not a line of text is printed as its length in 8 bytes, followed by its bytes.
  std::uint64_t length = 0;
  for (std::size_t i = 8; i-- > 0;) length = length << 8U | static_cast<unsigned char>(text.at(i));
  std::pair<std::string, std::string> field{line, text.substr(8, length)};
  text.remove_prefix(8 + length + 1);
  return field;
}

}  // namespace

void PrivateJournal::enter() {
  if (!fs::exists(kDaemon)) throw std::runtime_error(std::string("this machine has no ") + kDaemon);
  PrivateRoot::enter();
  require(mount("tmpfs", "/run", "tmpfs", 0, "mode=0755") == 0, "cannot mount a tmpfs on /run");
  enterPrivateDevices();
  fs::create_directories("/run/systemd/journald.conf.d");
  std::ofstream configuration("/run/systemd/journald.conf.d/private.conf");
  configuration << "[Journal]\nStorage=volatile\nRuntimeMaxUse=512M\nReadKMsg=no\nAudit=\nSeal=no\n"
                   "RateLimitIntervalSec=0\nRateLimitBurst=0\n"
                   "ForwardToSyslog=no\nForwardToKMsg=no\nForwardToConsole=no\nForwardToWall=no\n";
  configuration.close();
  require(configuration.good(), "cannot configure journald");
  hasEntered = true;
}

bool PrivateJournal::entered() {
  return hasEntered;
}

PrivateJournal::PrivateJournal(Sockets sockets) {
  fs::create_directories("/run/systemd/journal");
  fs::remove(kSocket);
  fs::remove_all("/run/log/journal");
  if (sockets == Sockets::ownedByManager) {
    listeningSocket_ = listenAt(kSocket);
    // The service manager does the same, so that journald knows the senders.
    const int on = 1;
    require(setsockopt(listeningSocket_, SOL_SOCKET, SO_PASSCRED, &on, sizeof on) == 0, "setsockopt");
  }
}

PrivateJournal::~PrivateJournal() {
  try {
    if (daemon_ != 0) stop();
  } catch (const std::exception& problem) {
    std::fprintf(stderr, "journald does not end: %s\n", problem.what());
  }
  if (listeningSocket_ >= 0) close(listeningSocket_);
  std::error_code ignored;
  fs::remove(kSocket, ignored);
}

void PrivateJournal::start() {
  fs::remove(kNotifySocket);
  const int notifySocket = listenAt(kNotifySocket);
  // LISTEN_PID must be journald's process identifier. The shell knows it, because `exec` replaces the shell
  // by journald.
  const std::string command = std::string("NOTIFY_SOCKET=") + kNotifySocket +
                              (listeningSocket_ >= 0 ? " LISTEN_FDS=1 LISTEN_PID=$$" : "") +
                              " exec setpriv --pdeathsig KILL " + kDaemon;
  const std::array<const char*, 4> arguments = {"sh", "-c", command.c_str(), nullptr};
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
  constexpr int kFirstPassed = 3;
  if (listeningSocket_ >= 0) posix_spawn_file_actions_adddup2(&actions, listeningSocket_, kFirstPassed);
  errno = posix_spawn(&daemon_, "/bin/sh", &actions, nullptr, const_cast<char* const*>(arguments.data()),
                      environ);
  posix_spawn_file_actions_destroy(&actions);
  require(errno == 0, kDaemon);
  awaitReady(notifySocket);
  close(notifySocket);
}

void PrivateJournal::stop() {
  resume();
  kill(daemon_, SIGTERM);
  while (waitpid(daemon_, nullptr, 0) < 0 && errno == EINTR) {
  }
  daemon_ = 0;
}

void PrivateJournal::suspend() const {
  require(kill(daemon_, SIGSTOP) == 0, "SIGSTOP");
  int status = 0;
  require(waitpid(daemon_, &status, WUNTRACED) == daemon_ && WIFSTOPPED(status), "journald does not stop");
}

void PrivateJournal::resume() const {
  require(kill(daemon_, SIGCONT) == 0, "SIGCONT");
}

std::vector<PrivateJournal::Entry> PrivateJournal::entries(const std::string& match) const {
  if (daemon_ != 0) {
    const ProcessResult synced = runProcess({"journalctl", "--sync"});
    if (synced.exitStatus != 0) throw std::runtime_error("journalctl --sync: " + synced.standardError);
  }
  const ProcessResult result = runProcess({"journalctl", "--quiet", "--all", "--output=export", match});
  if (result.exitStatus != 0) throw std::runtime_error("journalctl: " + result.standardError);
  std::vector<Entry> entries;
  Entry entry;
  std::string_view text = result.standardOutput;
  while (!text.empty()) {
    if (text.front() == '\n') {
      text.remove_prefix(1);
      entries.push_back(std::move(entry));
      entry.clear();
    } else {
      entry.insert(takeField(text));
    }
  }
  return entries;
}
