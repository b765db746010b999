#include "Runtime/Defaults/Private/SystemFileWatch.h"

#include <poll.h>
#include <sys/eventfd.h>
#include <sys/inotify.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <cstdint>
#include <system_error>
#include <utility>

#include "Runtime/Defaults/Private/FilePath.h"

namespace rt::detail {

namespace {

constexpr std::uint32_t kEvents = IN_CLOSE_WRITE | IN_CREATE | IN_DELETE | IN_MOVED_FROM | IN_MOVED_TO |
                                  IN_ATTRIB | IN_DELETE_SELF | IN_MOVE_SELF | IN_ONLYDIR;

[[noreturn]] void fail(const char* what) {
  throw std::system_error(errno, std::generic_category(), what);
}

}  // namespace

// NOLINTNEXTLINE(modernize-pass-by-value): callers keep their path, so it is copied in any case
SystemFileWatch::SystemFileWatch(const std::string& path)
    : path_(path), events_(inotify_init1(IN_CLOEXEC | IN_NONBLOCK)), wake_(eventfd(0, EFD_CLOEXEC)) {
  if (!events_) fail("inotify_init1");
  if (!wake_) fail("eventfd");
  arm();
}

SystemFileWatch::~SystemFileWatch() = default;

void SystemFileWatch::arm() {
  const std::string whole = folderOf(path_);
  std::vector<int> watched;
  // Watches the file's folder, or the nearest folder above it that can be watched. A folder below that one
  // may appear meanwhile, so the loop goes on until it finds the same folder twice.
  std::string found;
  for (std::string folder = whole;;) {
    const int watch = inotify_add_watch(events_.get(), folder.c_str(), kEvents);
    if (watch >= 0) {
      watched.push_back(watch);
      if (folder == whole || folder == found) break;
      found = std::exchange(folder, whole);
    } else if ((errno == ENOENT || errno == ENOTDIR || errno == EACCES) && folder != "/") {
      folder = folderOf(folder);
    } else {
      fail("inotify_add_watch");
    }
  }
  const int target = inotify_add_watch(events_.get(), folderOf(resolvedPath(path_)).c_str(), kEvents);
  if (target >= 0) watched.push_back(target);
  for (const int watch : watched_) {
    if (std::ranges::find(watched, watch) == watched.end()) inotify_rm_watch(events_.get(), watch);
  }
  watched_ = std::move(watched);
}

bool SystemFileWatch::wait() {
  std::array<pollfd, 2> ready{{{events_.get(), POLLIN, 0}, {wake_.get(), POLLIN, 0}}};
  while (poll(ready.data(), ready.size(), -1) < 0) {
    if (errno != EINTR) fail("poll");  // The system has no memory.
  }
  if (isStopped_.load(std::memory_order_relaxed)) return false;
  // Which events there are does not matter: all of them are taken, and the file is looked at.
  alignas(inotify_event) std::array<char, 16 * (sizeof(inotify_event) + NAME_MAX + 1)> events;
  while (read(events_.get(), events.data(), events.size()) > 0) {
  }
  arm();
  return true;
}

void SystemFileWatch::stop() noexcept {
  isStopped_.store(true, std::memory_order_relaxed);
  const std::uint64_t one = 1;
  while (::write(wake_.get(), &one, sizeof one) < 0 && errno == EINTR) {
  }
}

}  // namespace rt::detail
