// system TEST [ARGUMENT]: calls functions of the system that differ from Linux's.

#include <dirent.h>
#include <fcntl.h>
#include <os/lock.h>
#include <os/log.h>
#include <pthread.h>
#include <sys/event.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <string>
#include <thread>

#include "Check.h"

namespace {

// In an empty folder.
void testFiles() {
  errno = 0;
  check(mkdir("folder", 0750) == 0 && errno == 0, "a folder is made, and errno stays");
  check(mkdir("folder/file", 0700) == 0, "a folder in the folder");
  check(rmdir("folder") == -1 && errno == ENOTEMPTY, "ENOTEMPTY has its number");
  check(mkdir(std::string(300, 'x').c_str(), 0700) == -1 && errno == ENAMETOOLONG,
        "ENAMETOOLONG has its number");
  check(symlink("loop", "loop") == 0 && open("loop", O_RDONLY) == -1 && errno == ELOOP,
        "ELOOP has its number");
  check(std::string(std::strerror(ENOTEMPTY)) == "Directory not empty", "an error has its text");
  check(std::string(std::strerror(1000)) == "Unknown error: 1000", "an unknown error has its text");

  struct stat status{};
  check(stat("folder", &status) == 0 && S_ISDIR(status.st_mode) && (status.st_mode & 0777) == 0750, "stat");
  check(lstat("loop", &status) == 0 && S_ISLNK(status.st_mode), "lstat");

  const int file = open("text", O_RDWR | O_CREAT | O_EXCL | O_APPEND | O_CLOEXEC | O_NONBLOCK, 0640);
  check(file >= 0 && fstat(file, &status) == 0 && status.st_size == 0 && (status.st_mode & 0777) == 0640,
        "open");
  check((fcntl(file, F_GETFL) & (O_APPEND | O_NONBLOCK)) == (O_APPEND | O_NONBLOCK), "F_GETFL");
  check(fcntl(file, F_GETFD) == FD_CLOEXEC, "O_CLOEXEC");
  check(write(file, "abc", 3) == 3 && fcntl(file, F_FULLFSYNC) == 0, "F_FULLFSYNC");
  check(open("text", O_CREAT | O_EXCL, 0600) == -1 && errno == EEXIST, "O_EXCL");
  check(openat(AT_FDCWD, "loop", O_RDONLY | O_NOFOLLOW) == -1 && errno == ELOOP, "O_NOFOLLOW and AT_FDCWD");
  char path[1024];
  check(fcntl(file, F_GETPATH, path) == 0 && std::string(path).ends_with("/text"), "F_GETPATH");
  close(file);

  DIR* const folder = opendir(".");
  std::string names;
  while (const dirent* entry = readdir(folder)) {
    if (entry->d_name[0] != '.' && entry->d_namlen == std::strlen(entry->d_name)) names += entry->d_name[0];
  }
  closedir(folder);
  check(names.size() == 3, "a folder has its entries");
}

void testPipes() {
  int ends[2];
  check(pipe(ends) == 0 && fcntl(ends[1], F_SETNOSIGPIPE, 1) == 0 && fcntl(ends[1], F_GETNOSIGPIPE) == 1,
        "mark");
  fcntl(ends[0], F_SETFL, O_NONBLOCK);
  char byte = 0;
  check(read(ends[0], &byte, 1) == -1 && errno == EAGAIN, "EAGAIN has its number");
  close(ends[0]);
  check(write(ends[1], &byte, 1) == -1 && errno == EPIPE, "a descriptor with the mark sends no signal");
  close(ends[1]);
}

volatile std::sig_atomic_t received = 0;

void testSignals() {
  struct sigaction action{};
  action.sa_handler = [](int signal) { received = signal; };
  action.sa_flags = SA_RESTART;
  check(sigaction(SIGUSR1, &action, nullptr) == 0 && raise(SIGUSR1) == 0 && received == SIGUSR1, "a handler");
  struct sigaction previous{};
  check(sigaction(SIGUSR1, nullptr, &previous) == 0 && previous.sa_handler == action.sa_handler,
        "its address");
  check((previous.sa_flags & SA_RESTART) != 0, "its flag");
  sigset_t set;
  sigset_t before;
  sigemptyset(&set);
  sigaddset(&set, SIGUSR2);
  check(pthread_sigmask(SIG_BLOCK, &set, &before) == 0 && raise(SIGUSR2) == 0, "a signal is blocked");
  sigset_t pending;
  check(sigpending(&pending) == 0 && sigismember(&pending, SIGUSR2) == 1, "it is pending");
  int signal = 0;
  check(sigwait(&set, &signal) == 0 && signal == SIGUSR2, "it is taken");
}

void testProcesses() {
  std::fflush(nullptr);
  const pid_t child = fork();
  if (child == 0) {
    bool isCaught = false;
    std::thread([&] {
      try {
        throw 1;
      } catch (int) {
        isCaught = true;
      }
    }).join();
    _exit(isCaught ? 3 : 4);
  }
  int status = 0;
  check(waitpid(child, &status, 0) == child && WIFEXITED(status) && WEXITSTATUS(status) == 3,
        "the child of a fork starts a thread that throws and catches");
  const pid_t killed = fork();
  if (killed == 0) {
    raise(SIGBUS);
    _exit(0);
  }
  check(waitpid(killed, &status, 0) == killed && WIFSIGNALED(status) && WTERMSIG(status) == SIGBUS,
        "the signal of a child has its number");
}

void testExecuting(const char* self) {
  char first[] = "another name";
  char second[] = "executed";
  char* arguments[] = {first, second, nullptr};
  execv(self, arguments);
  check(false, "the program is executed");
}

void testThreads() {
  pthread_mutex_t mutex = PTHREAD_MUTEX_INITIALIZER;
  pthread_cond_t condition = PTHREAD_COND_INITIALIZER;
  bool isReady = false;
  std::thread other([&] {
    pthread_setname_np("other");
    char name[64];
    pthread_getname_np(pthread_self(), name, sizeof name);
    check(std::string(name) == "other" && pthread_main_np() == 0, "a thread has its name");
    pthread_mutex_lock(&mutex);
    isReady = true;
    pthread_cond_signal(&condition);
    pthread_mutex_unlock(&mutex);
  });
  pthread_mutex_lock(&mutex);
  while (!isReady) pthread_cond_wait(&condition, &mutex);
  check(pthread_mutex_trylock(&mutex) == EBUSY, "a mutex is locked");
  timespec past{};
  check(pthread_cond_timedwait(&condition, &mutex, &past) == ETIMEDOUT, "ETIMEDOUT has its number");
  pthread_mutex_unlock(&mutex);
  other.join();
  check(pthread_main_np() == 1, "this is the main thread");

  static os_unfair_lock lock = OS_UNFAIR_LOCK_INIT;
  static int count = 0;
  const auto work = [] {
    for (int round = 0; round < 10'000; ++round) {
      os_unfair_lock_lock(&lock);
      ++count;
      os_unfair_lock_unlock(&lock);
    }
  };
  std::thread one(work);
  std::thread two(work);
  one.join();
  two.join();
  check(count == 20'000, "a lock excludes other threads");
}

void testQueue() {
  const int queue = kqueue();
  const int folder = open(".", O_EVTONLY | O_CLOEXEC);
  struct kevent change;
  EV_SET(&change, static_cast<uintptr_t>(folder), EVFILT_VNODE, EV_ADD | EV_CLEAR, NOTE_WRITE, 0, nullptr);
  check(kevent(queue, &change, 1, nullptr, 0, nullptr) == 0, "a folder is watched");
  timespec noTime{};
  struct kevent event;
  check(kevent(queue, nullptr, 0, &event, 1, &noTime) == 0, "nothing has happened");
  close(open("new", O_CREAT | O_WRONLY, 0600));
  check(kevent(queue, nullptr, 0, &event, 1, nullptr) == 1, "something has happened");
  check(event.filter == EVFILT_VNODE && (event.fflags & NOTE_WRITE) != 0,
        "it is that the folder has changed");
  EV_SET(&change, 0, EVFILT_USER, EV_ADD | EV_CLEAR, NOTE_FFNOP, 0, nullptr);
  check(kevent(queue, &change, 1, nullptr, 0, nullptr) == 0, "the program may send an event");
  EV_SET(&change, 0, EVFILT_USER, 0, NOTE_TRIGGER, 0, nullptr);
  check(kevent(queue, &change, 1, nullptr, 0, nullptr) == 0, "it does");
  check(kevent(queue, nullptr, 0, &event, 1, nullptr) == 1 && event.filter == EVFILT_USER,
        "the event arrives");
  close(folder);

  mkdir("removed", 0700);
  const int removed = open("removed", O_EVTONLY | O_CLOEXEC);
  EV_SET(&change, static_cast<uintptr_t>(removed), EVFILT_VNODE, EV_ADD | EV_CLEAR, NOTE_DELETE, 0, nullptr);
  check(kevent(queue, &change, 1, nullptr, 0, nullptr) == 0, "another folder is watched");
  rmdir("removed");
  check(kevent(queue, nullptr, 0, &event, 1, nullptr) == 1 && event.fflags == NOTE_DELETE, "it is removed");
  close(removed);
  close(queue);
}

}  // namespace

int main(int count, char** arguments) {
  const std::string test = count > 1 ? arguments[1] : "";
  if (test == "executed") {
    std::printf("%s", arguments[0]);
  } else if (test == "files") {
    testFiles();
  } else if (test == "pipes") {
    testPipes();
  } else if (test == "signals") {
    testSignals();
  } else if (test == "processes") {
    testProcesses();
  } else if (test == "executing") {
    testExecuting(arguments[0]);
  } else if (test == "threads") {
    testThreads();
  } else if (test == "queue") {
    testQueue();
  } else if (test == "log") {
    os_log_t log = os_log_create("com.example", "net");
    os_log_with_type(log, OS_LOG_TYPE_ERROR, "a %{public}s, %s", "text", "secret");
  } else if (test == "foreign-unlock") {
    static os_unfair_lock lock = OS_UNFAIR_LOCK_INIT;
    os_unfair_lock_lock(&lock);
    std::thread([] { os_unfair_lock_unlock(&lock); }).join();
  } else if (test == "unknown-command") {
    fcntl(0, F_GETPROTECTIONCLASS);
    std::printf("still here\n");
  } else {
    return 100;
  }
  return failures();
}
