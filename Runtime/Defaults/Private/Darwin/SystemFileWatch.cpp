#include "Runtime/Defaults/Private/SystemFileWatch.h"

#include <fcntl.h>
#include <sys/event.h>
#include <unistd.h>

#include <cerrno>
#include <string>
#include <system_error>
#include <utility>

#include "Runtime/Defaults/Private/FilePath.h"

namespace rt::detail {

namespace {

constexpr unsigned kEvents = NOTE_WRITE | NOTE_EXTEND | NOTE_ATTRIB | NOTE_DELETE | NOTE_RENAME;

[[noreturn]] void fail(const char* what) {
  throw std::system_error(errno, std::generic_category(), what);
}

// Adds `path` to `queue`. Returns the descriptor that it is watched by, or none if nothing at the path can be
// opened. Events of its folder then tell when that changes.
FileDescriptor watch(int queue, const std::string& path) {
  FileDescriptor file(open(path.c_str(), O_EVTONLY | O_CLOEXEC));
  if (!file) {
    if (errno == ENOENT || errno == ENOTDIR || errno == EACCES || errno == ELOOP ||
        errno == EOPNOTSUPP) {  // a socket
      return file;
    }
    fail("open");
  }
  struct kevent event;
  EV_SET(&event, file.get(), EVFILT_VNODE, EV_ADD | EV_CLEAR, kEvents, 0, nullptr);
  if (kevent(queue, &event, 1, nullptr, 0, nullptr) != 0) fail("kevent");
  return file;
}

}  // namespace

SystemFileWatch::SystemFileWatch(const std::string& path) : path_(path), events_(kqueue()) {
  if (!events_) fail("kqueue");
  fcntl(events_.get(), F_SETFD, FD_CLOEXEC);
  struct kevent event;
  EV_SET(&event, 0, EVFILT_USER, EV_ADD | EV_CLEAR, 0, 0, nullptr);
  if (kevent(events_.get(), &event, 1, nullptr, 0, nullptr) != 0) fail("kevent");
  arm();
}

SystemFileWatch::~SystemFileWatch() = default;

void SystemFileWatch::arm() {
  // Events of a folder are about the names in it, and events of the file about its content.
  const std::string whole = folderOf(path_);
  std::vector<FileDescriptor> watched;
  // Watches the file's folder, or the nearest folder above it that can be watched. A folder below that one
  // may appear meanwhile, so the loop goes on until it finds the same folder twice.
  std::string found;
  for (std::string folder = whole;;) {
    if (FileDescriptor file = watch(events_.get(), folder)) {
      watched.push_back(std::move(file));
      if (folder == whole || folder == found) break;
      found = std::exchange(folder, whole);
    } else if (folder != "/") {
      folder = folderOf(folder);
    } else {
      fail("open");
    }
  }
  if (FileDescriptor target = watch(events_.get(), path_)) watched.push_back(std::move(target));
  files_ = std::move(watched);
}

bool SystemFileWatch::wait() {
  struct kevent event;
  while (kevent(events_.get(), nullptr, 0, &event, 1, nullptr) < 0) {
    if (errno != EINTR) fail("kevent");
  }
  if (isStopped_.load(std::memory_order_relaxed)) return false;
  arm();
  return true;
}

void SystemFileWatch::stop() noexcept {
  isStopped_.store(true, std::memory_order_relaxed);
  struct kevent event;
  EV_SET(&event, 0, EVFILT_USER, 0, NOTE_TRIGGER, 0, nullptr);
  kevent(events_.get(), &event, 1, nullptr, 0, nullptr);
}

}  // namespace rt::detail
