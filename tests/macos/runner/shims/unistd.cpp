#include <fcntl.h>
#include <grp.h>
#include <poll.h>
#include <sys/auxv.h>
#include <sys/mman.h>
#include <sys/param.h>
#include <sys/select.h>
#include <sys/statvfs.h>
#include <sys/uio.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "tests/macos/runner/Images.h"
#include "tests/macos/runner/Shims.h"
#include "tests/macos/runner/shims/Files.h"
#include "tests/macos/runner/shims/KernelQueue.h"
#include "tests/macos/runner/shims/Pipes.h"

namespace {

// ---- SIGPIPE ----

std::array<std::atomic<bool>, 4096> marks{};

std::atomic<bool>* markOf(int file) {
  const auto number = static_cast<std::size_t>(file);
  return file >= 0 && number < marks.size() ? &marks[number] : nullptr;
}

// Calls `call`, which may send SIGPIPE to this thread, and discards the signal if the descriptor has the
// mark.
template <class Call>
ssize_t withoutSigPipe(int file, Call call) {
  if (!hasNoSigPipe(file)) return converted(call());
  sigset_t pipe;
  sigset_t before;
  sigset_t pending;
  sigemptyset(&pipe);
  sigaddset(&pipe, SIGPIPE);
  pthread_sigmask(SIG_BLOCK, &pipe, &before);
  sigpending(&pending);
  const ssize_t result = call();
  const int error = errno;
  if (result < 0 && error == EPIPE && sigismember(&pending, SIGPIPE) == 0) {
    const timespec noTime{};
    sigtimedwait(&pipe, nullptr, &noTime);
  }
  pthread_sigmask(SIG_SETMASK, &before, nullptr);
  errno = error;
  return converted(result);
}

ssize_t writeTo(int file, const void* bytes, std::size_t size) {
  return withoutSigPipe(file, [&] { return write(file, bytes, size); });
}

ssize_t writePartsTo(int file, const iovec* parts, int count) {
  return withoutSigPipe(file, [&] { return writev(file, parts, count); });
}

// ---- Descriptors ----

int closeFile(int file) {
  forgetNoSigPipe(file);
  KernelQueue::closing(file);
  return converted(close(file));
}

int duplicate(int file) {
  const int copy = dup(file);
  if (copy >= 0) copyNoSigPipe(file, copy);
  return converted(copy);
}

int duplicateTo(int file, int copy) {
  if (file != copy && fcntl(file, F_GETFD) >= 0) KernelQueue::closing(copy);
  const int result = dup2(file, copy);
  if (result >= 0) copyNoSigPipe(file, copy);
  return converted(result);
}

int accessAt(int folder, const char* path, int mode, int flags) {
  return converted(faccessat(linuxFolder(folder), path, mode, linuxAtFlags(flags)));
}

int unlinkAt(int folder, const char* path, int flags) {
  return converted(unlinkat(linuxFolder(folder), path, linuxAtFlags(flags)));
}

int renameAt(int fromFolder, const char* from, int toFolder, const char* to) {
  return converted(renameat(linuxFolder(fromFolder), from, linuxFolder(toFolder), to));
}

// poll of macOS does not support devices: it reports them as invalid.
int pollFiles(pollfd* files, unsigned count, int milliseconds) {
  for (unsigned number = 0; number < count; ++number) {
    // The events up to POLLNVAL have the same bits.
    constexpr int kCommon = POLLIN | POLLPRI | POLLOUT | POLLERR | POLLHUP | POLLNVAL;
    if ((files[number].events & ~kCommon) != 0) {
      refuse("poll is called with the events 0x%x", static_cast<unsigned>(files[number].events));
    }
  }
  return converted(poll(files, count, milliseconds));
}

// ---- The process ----

long systemValue(int name) {
  switch (name) {
    case 1:
      return sysconf(_SC_ARG_MAX);
    case 5:
      return sysconf(_SC_OPEN_MAX);
    case 29:
      return sysconf(_SC_PAGESIZE);
    case 57:
      return sysconf(_SC_NPROCESSORS_CONF);
    case 58:
      return sysconf(_SC_NPROCESSORS_ONLN);
    case 70:
      return sysconf(_SC_GETGR_R_SIZE_MAX);
    case 71:
      return sysconf(_SC_GETPW_R_SIZE_MAX);
    default:
      refuse("sysconf is called with %d", name);
  }
}

int isSetId() {
  return getauxval(AT_SECURE) != 0 ? 1 : 0;
}

int replaceEffectiveUser(uid_t user) {
  return converted(seteuid(user));
}

int replaceEffectiveGroup(gid_t group) {
  return converted(setegid(group));
}

const char* programName() {
  const Arguments& arguments = Images::arguments();
  const char* const path = arguments.count > 0 ? arguments.values[0] : "";
  const char* const slash = std::strrchr(path, '/');
  return slash == nullptr ? path : slash + 1;
}

// Starts a Mach-O program with this runner, and any other program as usual.
int execute(const char* path, char* const* arguments, char* const* environment) {
  if (!isMachO(bytesOfFile(path))) return converted(execve(path, arguments, environment));
  if (access(path, X_OK) != 0) return converted(-1);
  std::string runner = "/proc/self/exe";
  std::string option = "--argument-0";
  std::string file = path;
  std::string empty;
  std::vector<char*> all = {runner.data(), option.data(),
                            arguments[0] == nullptr ? empty.data() : arguments[0], file.data()};
  for (std::size_t number = 1; arguments[0] != nullptr && arguments[number] != nullptr; ++number) {
    all.push_back(arguments[number]);
  }
  all.push_back(nullptr);
  return converted(execve(runner.c_str(), all.data(), environment));
}

int executeHere(const char* path, char* const* arguments) {
  return execute(path, arguments, environ);
}

int executeFound(const char* name, char* const* arguments) {
  if (std::strchr(name, '/') != nullptr) return executeHere(name, arguments);
  return converted(execvp(name, arguments));
}

}  // namespace

int setNoSigPipe(int file, bool isSet) {
  if (fcntl(file, F_GETFD) < 0) return -1;
  std::atomic<bool>* const mark = markOf(file);
  if (mark == nullptr) refuse("F_SETNOSIGPIPE is used on the descriptor %d", file);
  mark->store(isSet);
  return 0;
}

bool hasNoSigPipe(int file) {
  const std::atomic<bool>* const mark = markOf(file);
  return mark != nullptr && mark->load();
}

void forgetNoSigPipe(int file) {
  if (std::atomic<bool>* const mark = markOf(file)) mark->store(false);
}

void copyNoSigPipe(int file, int copy) {
  if (std::atomic<bool>* const mark = markOf(copy)) mark->store(hasNoSigPipe(file));
}

shims::Table shims::unistd() {
  static const Shim table[] = {
      shim("read", systemCall<&::read>),
      shim("pread", systemCall<&::pread>),
      shim("write", &writeTo),
      shim("writev", &writePartsTo),
      shim("close", &closeFile),
      shim("dup", &duplicate),
      shim("dup2", &duplicateTo),
      shim("pipe", systemCall<static_cast<int (*)(int*)>(&::pipe)>),
      shim("poll", &pollFiles),
      shim("lseek", systemCall<&::lseek>),
      shim("fsync", systemCall<&::fsync>),
      shim("ftruncate", systemCall<&::ftruncate>),
      shim("truncate", systemCall<&::truncate>),
      shim("rmdir", systemCall<&::rmdir>),
      shim("chown", systemCall<&::chown>),
      shim("lchown", systemCall<&::lchown>),
      shim("fchown", systemCall<&::fchown>),
      shim("access", systemCall<&::access>),
      shim("faccessat", &accessAt),
      shim("unlink", systemCall<&::unlink>),
      shim("unlinkat", &unlinkAt),
      shim("rename", systemCall<&::rename>),
      shim("renameat", &renameAt),
      shim("link", systemCall<&::link>),
      shim("symlink", systemCall<&::symlink>),
      shim("readlink", systemCall<&::readlink>),
      shim("getcwd", systemCall<&::getcwd>),
      shim("chdir", systemCall<&::chdir>),
      shim("fchdir", systemCall<&::fchdir>),
      shim("isatty", systemCall<&::isatty>),
      shim("getpid", &::getpid),
      shim("getppid", &::getppid),
      shim("getuid", &::getuid),
      shim("geteuid", &::geteuid),
      shim("getgid", &::getgid),
      shim("getegid", &::getegid),
      shim("setuid", systemCall<&::setuid>),
      shim("setgid", systemCall<&::setgid>),
      shim("seteuid", &replaceEffectiveUser),
      shim("setegid", &replaceEffectiveGroup),
      shim("issetugid", &isSetId),
      shim("getprogname", &programName),
      shim("sysconf", &systemValue),
      shim("fork", systemCall<&::fork>),
      shim("execv", &executeHere),
      shim("execve", &execute),
      shim("execvp", &executeFound),
      shim("_exit", &::_exit),
      shim("sleep", &::sleep),
      shim("usleep", systemCall<&::usleep>),
      shim("alarm", &::alarm),
      shim("pause", systemCall<&::pause>),
  };
  return table;
}
