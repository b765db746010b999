#include <pthread.h>

#include <array>
#include <atomic>
#include <csignal>
#include <cstddef>

#include "tests/macos/runner/Shims.h"
#include "tests/macos/runner/shims/Signals.h"

namespace {

struct Signal {
  int linux;
  int darwin;
};

constexpr Signal kSignals[] = {{SIGBUS, 10},  {SIGSYS, 12},  {SIGURG, 16}, {SIGSTOP, 17}, {SIGTSTP, 18},
                               {SIGCONT, 19}, {SIGCHLD, 20}, {SIGIO, 23},  {SIGUSR1, 30}, {SIGUSR2, 31}};
constexpr int kSignalCount = 32;

using Handler = void (*)(int);

std::array<std::atomic<Handler>, 65> handlers{};

void handle(int signal) {
  handlers[static_cast<std::size_t>(signal)].load()(darwinSignal(signal));
}

// struct sigaction of macOS
struct Action {
  Handler handler;
  DarwinSignals mask;
  int flags;
};

struct Flag {
  int darwin;
  int linux;
};
constexpr Flag kFlags[] = {{0x1, SA_ONSTACK},   {0x2, SA_RESTART},  {0x4, static_cast<int>(SA_RESETHAND)},
                           {0x8, SA_NOCLDSTOP}, {0x10, SA_NODEFER}, {0x20, SA_NOCLDWAIT}};

int changeAction(int darwin, const Action* given, Action* previous) {
  const int number = linuxSignal(darwin);
  std::atomic<Handler>& known = handlers[static_cast<std::size_t>(number)];
  struct sigaction next{};
  struct sigaction before{};
  const Handler handlerBefore = known.load();
  if (given != nullptr) {
    // SIG_DFL, SIG_IGN and SIG_ERR are the same.
    const bool isFunction = given->handler != SIG_DFL && given->handler != SIG_IGN;
    next.sa_handler = isFunction ? &handle : given->handler;
    next.sa_mask = linuxSignals(given->mask);
    int flags = given->flags;
    for (const Flag& flag : kFlags) {
      if ((flags & flag.darwin) == 0) continue;
      next.sa_flags |= flag.linux;
      flags &= ~flag.darwin;
    }
    if (flags != 0) refuse("sigaction is called with the flag 0x%x", static_cast<unsigned>(flags));
    if (isFunction) known.store(given->handler);
  }
  const int result = sigaction(number, given == nullptr ? nullptr : &next, &before);
  if (result != 0) return converted(result);
  if (previous != nullptr) {
    previous->handler = before.sa_handler == &handle ? handlerBefore : before.sa_handler;
    previous->mask = darwinSignals(before.sa_mask);
    previous->flags = 0;
    for (const Flag& flag : kFlags) {
      if ((before.sa_flags & flag.linux) != 0) previous->flags |= flag.darwin;
    }
  }
  return 0;
}

Handler setHandler(int darwin, Handler handler) {
  constexpr int kRestart = 0x2;
  const Action action{.handler = handler, .mask = 0, .flags = kRestart};
  Action previous{};
  return changeAction(darwin, &action, &previous) == 0 ? previous.handler : SIG_ERR;
}

int changeMaskWith(int how, const DarwinSignals* given, DarwinSignals* previous) {
  // SIG_BLOCK, SIG_UNBLOCK and SIG_SETMASK are 1, 2 and 3.
  sigset_t next{};
  sigset_t before{};
  if (given != nullptr) next = linuxSignals(*given);
  const int error = pthread_sigmask(how - 1, given == nullptr ? nullptr : &next, &before);
  if (error == 0 && previous != nullptr) *previous = darwinSignals(before);
  return darwinError(error);
}

int changeMask(int how, const DarwinSignals* given, DarwinSignals* previous) {
  const int error = changeMaskWith(how, given, previous);
  if (error == 0) return 0;
  errno = error;
  return -1;
}

int pending(DarwinSignals* signals) {
  sigset_t found;
  const int result = sigpending(&found);
  *signals = darwinSignals(found);
  return converted(result);
}

int waitFor(const DarwinSignals* signals, int* signal) {
  const sigset_t set = linuxSignals(*signals);
  int found = 0;
  const int error = sigwait(&set, &found);
  *signal = darwinSignal(found);
  return darwinError(error);
}

int raiseSignal(int signal) {
  return converted(raise(linuxSignal(signal)));
}

int sendSignal(pid_t process, int signal) {
  return converted(kill(process, linuxSignal(signal)));
}

int sendSignalToThread(pthread_t thread, int signal) {
  return darwinError(pthread_kill(thread, linuxSignal(signal)));
}

// stack_t of macOS
struct Stack {
  void* begin;
  std::size_t size;
  int flags;
};

// SS_ONSTACK is 1 on both systems.
constexpr int kDarwinDisable = 4;

int changeStack(const Stack* given, Stack* previous) {
  stack_t next{};
  stack_t before{};
  if (given != nullptr) {
    next = {.ss_sp = given->begin,
            .ss_flags = (given->flags & kDarwinDisable) != 0 ? SS_DISABLE : 0,
            .ss_size = given->size};
  }
  const int result = sigaltstack(given == nullptr ? nullptr : &next, &before);
  if (result == 0 && previous != nullptr) {
    const int disabled = (before.ss_flags & SS_DISABLE) != 0 ? kDarwinDisable : 0;
    *previous = {before.ss_sp, before.ss_size, disabled | (before.ss_flags & SS_ONSTACK)};
  }
  return converted(result);
}

}  // namespace

int darwinSignal(int signal) {
  for (const Signal& each : kSignals) {
    if (each.linux == signal) return each.darwin;
  }
  return signal;
}

int linuxSignal(int signal) {
  for (const Signal& each : kSignals) {
    if (each.darwin == signal) return each.linux;
  }
  // SIGEMT and SIGINFO
  if (signal == 7 || signal == 29) refuse("Linux has no signal that is like number %d of macOS", signal);
  return signal;
}

sigset_t linuxSignals(DarwinSignals signals) {
  sigset_t result;
  sigemptyset(&result);
  for (int signal = 1; signal < kSignalCount; ++signal) {
    if (signal == 7 || signal == 29) continue;
    if ((signals & (1U << (signal - 1))) != 0) sigaddset(&result, linuxSignal(signal));
  }
  return result;
}

DarwinSignals darwinSignals(const sigset_t& signals) {
  DarwinSignals result = 0;
  for (int signal = 1; signal < kSignalCount; ++signal) {
    if (sigismember(&signals, signal) == 1 && darwinSignal(signal) < kSignalCount) {
      result |= 1U << (darwinSignal(signal) - 1);
    }
  }
  return result;
}

shims::Table shims::signal() {
  static const Shim table[] = {
      shim("sigaction", &changeAction), shim("signal", &setHandler),
      shim("sigprocmask", &changeMask), shim("pthread_sigmask", &changeMaskWith),
      shim("sigpending", &pending),     shim("sigwait", &waitFor),
      shim("raise", &raiseSignal),      shim("sigaltstack", &changeStack),
      shim("kill", &sendSignal),        shim("pthread_kill", &sendSignalToThread),
  };
  return table;
}
