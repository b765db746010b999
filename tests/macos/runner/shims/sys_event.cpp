// A queue is an inotify descriptor, and a descriptor of its own for the event that the program sends to
// itself. A file is watched until its descriptor is closed, as on macOS.

#include <poll.h>
#include <pthread.h>
#include <sys/eventfd.h>
#include <sys/inotify.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstring>
#include <ctime>
#include <map>
#include <mutex>
#include <string>

#include "KernelQueue.h"
#include "tests/macos/runner/Shims.h"

namespace {

// struct kevent of macOS
struct Event {
  std::uint64_t identifier;
  std::int16_t filter;
  std::uint16_t flags;
  std::uint32_t filterFlags;
  std::int64_t data;
  void* context;
};
static_assert(sizeof(Event) == 32);

constexpr std::int16_t kFile = -4;
constexpr std::int16_t kUser = -10;

constexpr std::uint16_t kAdd = 0x1;
constexpr std::uint16_t kEnable = 0x4;
constexpr std::uint16_t kClear = 0x20;

constexpr std::uint32_t kTrigger = 0x01000000;
constexpr std::uint32_t kDeleted = 0x1;
constexpr std::uint32_t kWritten = 0x2;
constexpr std::uint32_t kExtended = 0x4;
constexpr std::uint32_t kAttributes = 0x8;
constexpr std::uint32_t kLinks = 0x10;
constexpr std::uint32_t kRenamed = 0x20;

// inotify does not tell that a folder was removed while it is open, so the folder above is watched, too.
struct Watch {
  int number;  // inotify's
  int above;   // that of the folder above, or -1
  std::uint32_t wanted;
  void* context;
};

struct Queue {
  int user;
  // Both by the watched descriptor. Events stay until the program takes them.
  std::map<int, Watch> watches;
  std::map<int, Event> events;
};

// Never destroyed, since threads may wait for events while the process ends.
std::map<int, Queue>& queues = *new std::map<int, Queue>;
std::mutex lock;

// Queues are not inherited by the child of a fork. A handler of the program may wait for a thread that uses a
// queue, so this one is registered before all of them, and is called after them.
[[maybe_unused]] const int registered = pthread_atfork([] { lock.lock(); }, [] { lock.unlock(); },
                                                       [] {
                                                         for (const auto& [file, queue] : queues) {
                                                           close(file);
                                                           close(queue.user);
                                                         }
                                                         queues.clear();
                                                         lock.unlock();
                                                       });

int makeQueue() {
  const int file = inotify_init1(IN_NONBLOCK);
  if (file < 0) return converted(file);
  const int user = eventfd(0, EFD_NONBLOCK | EFD_CLOEXEC);
  if (user < 0) {
    convertErrno();
    close(file);
    return -1;
  }
  const std::lock_guard guard(lock);
  queues[file] = {.user = user, .watches = {}, .events = {}};
  return file;
}

int addWatch(int queueFile, Queue& queue, const Event& change) {
  constexpr std::uint32_t kKnown = kDeleted | kWritten | kExtended | kAttributes | kLinks | kRenamed;
  if ((change.filterFlags & ~kKnown) != 0) refuse("kevent watches a file for 0x%x", change.filterFlags);
  const auto file = static_cast<int>(change.identifier);
  const std::string link = "/proc/self/fd/" + std::to_string(file);
  constexpr std::uint32_t kMask = IN_MODIFY | IN_ATTRIB | IN_DELETE_SELF | IN_MOVE_SELF | IN_CREATE |
                                  IN_DELETE | IN_MOVED_FROM | IN_MOVED_TO;
  const int number = inotify_add_watch(queueFile, link.c_str(), kMask);
  if (number < 0) return converted(number);
  struct stat status{};
  const bool isFolder = fstat(file, &status) == 0 && S_ISDIR(status.st_mode);
  const int above = isFolder ? inotify_add_watch(queueFile, (link + "/..").c_str(), kMask) : -1;
  queue.watches[file] = {
      .number = number, .above = above, .wanted = change.filterFlags, .context = change.context};
  return 0;
}

int apply(int queueFile, Queue& queue, const Event& change) {
  if ((change.flags & ~(kAdd | kEnable | kClear)) != 0)
    refuse("kevent is called with the flags 0x%x", change.flags);
  if (change.filter == kFile) return addWatch(queueFile, queue, change);
  if (change.filter != kUser || change.identifier != 0)
    refuse("kevent is called with the filter %d", change.filter);
  if ((change.filterFlags & kTrigger) != 0) {
    const std::uint64_t one = 1;
    if (write(queue.user, &one, sizeof one) < 0) return converted(-1);
  }
  return 0;
}

bool isRemoved(int file) {
  struct stat status{};
  return fstat(file, &status) == 0 && status.st_nlink == 0;
}

// What an event of inotify is on macOS, for a watched file.
std::uint32_t darwinFlags(const inotify_event& event, const Watch& watch, int file) {
  if (event.wd == watch.above && (event.mask & IN_DELETE) != 0 && isRemoved(file)) return kDeleted;
  if (event.wd != watch.number) return 0;
  std::uint32_t flags = 0;
  if ((event.mask & IN_MODIFY) != 0) flags |= kWritten | kExtended;
  if ((event.mask & (IN_CREATE | IN_DELETE | IN_MOVED_FROM | IN_MOVED_TO)) != 0) flags |= kWritten;
  if ((event.mask & IN_DELETE_SELF) != 0) flags |= kDeleted;
  if ((event.mask & IN_MOVE_SELF) != 0) flags |= kRenamed;
  if ((event.mask & IN_ATTRIB) != 0) flags |= isRemoved(file) ? kDeleted : kAttributes;
  return flags;
}

// Takes what inotify has. Returns 0, or -1.
int collect(int queueFile, Queue& queue) {
  alignas(inotify_event) std::array<char, 65536> buffer;
  const ssize_t size = read(queueFile, buffer.data(), buffer.size());
  if (size < 0) return errno == EAGAIN ? 0 : converted(-1);
  for (ssize_t at = 0; at < size;) {
    inotify_event event{};
    std::memcpy(&event, buffer.data() + at, sizeof event);
    at += static_cast<ssize_t>(sizeof event + event.len);
    for (const auto& [file, watch] : queue.watches) {
      const std::uint32_t flags = darwinFlags(event, watch, file) & watch.wanted;
      if (flags == 0) continue;
      Event& darwin = queue.events[file];
      darwin.identifier = static_cast<std::uint64_t>(file);
      darwin.filter = kFile;
      darwin.filterFlags |= flags;
      darwin.context = watch.context;
    }
  }
  return 0;
}

// Moves what has happened into `events`. Returns how many there are, or -1.
int take(int queueFile, Queue& queue, Event* events, int room) {
  int count = 0;
  std::uint64_t triggers = 0;
  if (read(queue.user, &triggers, sizeof triggers) == sizeof triggers) {
    events[count] = {};
    events[count++].filter = kUser;
  }
  if (collect(queueFile, queue) != 0) return -1;
  while (count < room && !queue.events.empty()) {
    events[count++] = queue.events.begin()->second;
    queue.events.erase(queue.events.begin());
  }
  return count;
}

int changeAndWait(int queueFile, const Event* changes, int changeCount, Event* events, int room,
                  const timespec* timeout) {
  for (;;) {
    std::array<pollfd, 2> files{};
    {
      const std::lock_guard guard(lock);
      const auto found = queues.find(queueFile);
      if (found == queues.end()) {
        errno = EBADF;
        return -1;
      }
      Queue& queue = found->second;
      for (; changeCount != 0; --changeCount, ++changes) {
        if (apply(queueFile, queue, *changes) != 0) return -1;
      }
      if (room == 0) return 0;
      if (const int count = take(queueFile, queue, events, room); count != 0) return count;
      files = {{{.fd = queueFile, .events = POLLIN, .revents = 0},
                {.fd = queue.user, .events = POLLIN, .revents = 0}}};
    }
    const int ready = ppoll(files.data(), files.size(), timeout, nullptr);
    if (ready <= 0) return converted(ready);
  }
}

}  // namespace

void KernelQueue::closing(int file) {
  const std::lock_guard guard(lock);
  if (const auto queue = queues.find(file); queue != queues.end()) {
    close(queue->second.user);
    queues.erase(queue);
    return;
  }
  for (auto& [queueFile, queue] : queues) {
    const auto watch = queue.watches.find(file);
    if (watch == queue.watches.end()) continue;
    const Watch gone = watch->second;
    queue.watches.erase(watch);
    queue.events.erase(file);
    // inotify has one watch for a file, whatever the number of descriptors.
    for (const int number : {gone.number, gone.above}) {
      const bool isShared = std::ranges::any_of(queue.watches, [&](const auto& other) {
        return other.second.number == number || other.second.above == number;
      });
      if (number >= 0 && !isShared) inotify_rm_watch(queueFile, number);
    }
  }
}

shims::Table shims::sysEvent() {
  static const Shim table[] = {
      shim("kqueue", &makeQueue),
      shim("kevent", &changeAndWait),
  };
  return table;
}
