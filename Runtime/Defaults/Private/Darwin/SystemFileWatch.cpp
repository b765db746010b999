#include "Runtime/Defaults/Private/SystemFileWatch.h"

#include <fcntl.h>
#include <sys/event.h>
#include <unistd.h>

#include <cerrno>
#include <system_error>
#include <utility>

#include "Runtime/Defaults/Private/FilePath.h"

namespace rt::detail {

namespace {

constexpr unsigned kEvents = NOTE_WRITE | NOTE_EXTEND | NOTE_ATTRIB | NOTE_DELETE | NOTE_RENAME;

[[noreturn]] void fail(const char* what) {
  throw std::system_error(errno, std::generic_category(), what);
}

// Adds `path` to `queue`. Returns the descriptor that it is watched by, or none if it cannot be opened.
FileDescriptor watch(int queue, const char* path) {
  FileDescriptor file(open(path, O_EVTONLY | O_CLOEXEC));
  if (!file) return file;
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

SystemFileWatch::~SystemFileWatch() {
  for (const int file : watched_) close(file);
}

void SystemFileWatch::arm() {
  // Events of a folder are about the names in it, and events of the file about its content.
  std::vector<int> watched;
  watched.reserve(2);
  std::string folder = folderOf(path_);
  FileDescriptor file = watch(events_.get(), folder.c_str());
  while (!file && folder != "/") {
    folder = folderOf(folder);
    file = watch(events_.get(), folder.c_str());
  }
  if (!file) fail("open");
  FileDescriptor target = watch(events_.get(), path_.c_str());
  watched.push_back(file.release());
  if (target) watched.push_back(target.release());
  for (const int old : watched_) close(old);
  watched_ = std::move(watched);
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
