// Everything that a handler needs is made by `install`, since a handler must not allocate. A message needs a
// string for its text, and a string's length never changes. So there is a string of each length over one
// buffer, and the handler chooses the one of the right length.

#include "Shared/Logging/Loggers/LUMLogCrash.h"

#include <cxxabi.h>
#include <pthread.h>
#include <sys/mman.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <exception>
#include <memory>
#include <new>
#include <span>
#include <string_view>
#include <typeinfo>
#include <utility>

#include "Runtime/Base/Private/StandardError.h"
#include "Runtime/Locks/Private/Lazy.h"
#include "Runtime/Locks/Private/ThreadIdentifier.h"
#include "Runtime/Objects/StringObject.h"
#include "Shared/Logging/LUMLogMessage.h"
#include "Shared/Logging/LUMLogMetadata.h"
#include "Shared/Logging/Loggers/LUMLogLine.h"
#include "Shared/Logging/Loggers/LUMLogOutput.h"
#include "Shared/Logging/Loggers/Private/LUMLogCrashEntry.h"

namespace {

using namespace rt::literals;

constexpr std::size_t kLongestText = 400;
constexpr std::size_t kStackSize = std::size_t{64} * 1024;

struct Signal {
  int number;
  std::string_view name;
  struct sigaction previous{};
};

constinit std::array<Signal, 7> signals{{{.number = SIGSEGV, .name = "SIGSEGV"},
                                         {.number = SIGBUS, .name = "SIGBUS"},
                                         {.number = SIGILL, .name = "SIGILL"},
                                         {.number = SIGFPE, .name = "SIGFPE"},
                                         {.number = SIGABRT, .name = "SIGABRT"},
                                         {.number = SIGSYS, .name = "SIGSYS"},
                                         {.number = SIGTRAP, .name = "SIGTRAP"}}};

constinit std::atomic<std::terminate_handler> previousTerminate = nullptr;

// What the crash message is made of.
struct Material {
  std::array<char, kLongestText> buffer{};
  // The string of index n has the first n bytes of the buffer.
  std::array<rt::String, kLongestText + 1> texts;
  rt::Ref<LUMLogMetadata> metadata;
};

constinit std::atomic<Material*> material = nullptr;

// The beginning of the line, which a thread sets while it is the one that writes.
struct Cause {
  std::string_view name;
  bool hasAddress = false;
  const void* address = nullptr;
  std::int64_t sender = 0;
  std::string_view type;
  std::string_view what;
};

constinit thread_local const Cause* cause [[gnu::tls_model("initial-exec")]] = nullptr;

class CrashMessage final : public rt::Implements<CrashMessage, LUMLogMessage> {
 public:
  static constexpr std::string_view kClassName = "LUMLogCrashMessage";

  CrashMessage(const rt::String& text, const rt::Ref<LUMLogMetadata>& metadata)
      : Implements(LUMLogLevelFault, text, text, nullptr, nullptr, 0, ""_s, nullptr, nullptr, nullptr,
                   metadata) {}
};

void appendHexadecimal(LUMLogLine& line, std::uintptr_t value) noexcept {
  constexpr std::string_view kDigits = "0123456789abcdef";
  line.append("0x");
  bool isLeading = true;
  for (unsigned shift = 8 * sizeof(value); shift > 0;) {
    shift -= 4;
    const std::size_t digit = value >> shift & 0xFU;
    isLeading = isLeading && digit == 0 && shift != 0;
    if (!isLeading) line.append(kDigits[digit]);
  }
}

void appendText(LUMLogLine& line, const Cause& given, const LUMLogCrashEntry::Losses& losses) noexcept {
  line.append(given.name);
  if (given.hasAddress) {
    line.append(" at address ");
    appendHexadecimal(line, reinterpret_cast<std::uintptr_t>(given.address));
  }
  if (given.sender != 0) {
    line.append(" from process ");
    line.appendNumber(given.sender);
  }
  line.append(" in thread ");
  line.appendUnsigned(rt::currentThreadIdentifier());
  if (!given.type.empty()) {
    line.append(": an exception of type ");
    line.append(given.type);
  }
  if (!given.what.empty()) {
    line.append(": ");
    line.appendEscaped(given.what);
  }
  if (losses.waiting != 0) {
    line.append("; messages that could not be written: ");
    line.appendUnsigned(losses.waiting);
  }
  if (losses.dropped != 0) {
    line.append("; messages that full queues had dropped: ");
    line.appendUnsigned(losses.dropped);
  }
}

// Leaves only ASCII: a string must be valid UTF-8, also if a character does not fit.
void makeASCII(std::span<char> text) noexcept {
  for (char& byte : text) {
    if (static_cast<unsigned char>(byte) >= 0x80) byte = '?';
  }
}

void report(LUMLogOutput* output, const LUMLogCrashEntry::Losses& losses) {
  Material* const made = material.load(std::memory_order_acquire);
  LUMLogLine line(made->buffer, LUMLogLine::Caller::kSignalHandler);
  appendText(line, *cause, losses);
  const std::size_t length = line.text().size();
  makeASCII({made->buffer.data(), length});
  if (output != nullptr) {
    output->logInSignalHandler(CrashMessage(made->texts[length], made->metadata));
    return;
  }
  std::array<char, kLongestText + 1> place{};
  LUMLogLine whole(place, LUMLogLine::Caller::kSignalHandler);
  whole.append(line.text());
  whole.append('\n');
  rt::StandardError::write(whole.text(), std::chrono::seconds(1));
}

// Returns false if the calling thread is writing already.
bool writeAll(const Cause& given) {
  const Cause* const outer = std::exchange(cause, &given);
  const bool isFirst = LUMLogCrashEntry::writeAll(report);
  cause = outer;
  return isFirst;
}

// Returns whether the signal comes again when the handler returns: the instruction that failed fails again.
bool comesAgain(int number, const siginfo_t& info) noexcept {
  return info.si_code > 0 && (number == SIGSEGV || number == SIGBUS || number == SIGILL || number == SIGFPE);
}

void handle(int number, siginfo_t* info, void* /*context*/) {
  const int error = errno;
  for (const Signal& each : signals) {
    if (each.number != number) continue;
    Cause given;
    given.name = each.name;
    const bool isSent = info->si_code <= 0;
    given.hasAddress =
        !isSent && (number == SIGSEGV || number == SIGBUS || number == SIGILL || number == SIGFPE);
    given.address = info->si_addr;
    if (isSent && info->si_pid != getpid()) given.sender = info->si_pid;
    struct sigaction next = each.previous;
    if (!writeAll(given)) {
      // A crash while messages were being written.
      next = {};
      next.sa_handler = SIG_DFL;
    }
    sigaction(number, &next, nullptr);
    // Blocked until the handler returns.
    if (!comesAgain(number, *info)) pthread_kill(pthread_self(), number);
  }
  errno = error;
}

[[noreturn]] void terminate() {
  Cause given;
  given.name = "std::terminate";
  if (const std::type_info* const type = abi::__cxa_current_exception_type()) given.type = type->name();
  try {
    if (std::current_exception()) throw;
    writeAll(given);
  } catch (const std::exception& exception) {
    given.what = exception.what();
    writeAll(given);
  } catch (...) {
    writeAll(given);
  }
  if (const std::terminate_handler previous = previousTerminate.load()) previous();
  std::abort();
}

void installHandlers() {
  auto made = std::make_unique<Material>();
  for (std::size_t length = 0; length <= kLongestText; ++length)
    made->texts[length] = rt::String::from(rt::StringObject::over({made->buffer.data(), length}));
  made->metadata = LUMLogMetadata::metadataWithComponent("LUMLogCrash"_s);
  material.store(made.release(), std::memory_order_release);

  for (Signal& each : signals) {
    if (sigaction(each.number, nullptr, &each.previous) != 0 || each.previous.sa_handler == SIG_IGN) continue;
    struct sigaction action{};
    action.sa_sigaction = handle;
    action.sa_flags = SA_SIGINFO | SA_ONSTACK;
    sigfillset(&action.sa_mask);
    sigaction(each.number, &action, nullptr);
  }
  previousTerminate = std::set_terminate(terminate);
}

// The stack for handlers on one thread, below a page that catches an overflow.
constexpr std::size_t kGuardSize = std::size_t{64} * 1024;

void removeStack(void* memory) {
  stack_t none{};
  none.ss_flags = SS_DISABLE;
  none.ss_size = kStackSize;
  sigaltstack(&none, nullptr);
  munmap(memory, kGuardSize + kStackSize);
}

void giveStack() {
  static constinit rt::Lazy<pthread_key_t> key;
  const pthread_key_t end = key.get([] {
    pthread_key_t made{};
    if (pthread_key_create(&made, removeStack) != 0) throw std::bad_alloc();
    return made;
  });
  stack_t present{};
  if (sigaltstack(nullptr, &present) != 0 || (present.ss_flags & SS_DISABLE) == 0) return;
  void* const memory =
      mmap(nullptr, kGuardSize + kStackSize, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  if (memory == MAP_FAILED) throw std::bad_alloc();
  mprotect(memory, kGuardSize, PROT_NONE);
  stack_t stack{};
  stack.ss_sp = static_cast<std::byte*>(memory) + kGuardSize;
  stack.ss_size = kStackSize;
  if (pthread_setspecific(end, memory) != 0 || sigaltstack(&stack, nullptr) != 0) {
    pthread_setspecific(end, nullptr);
    munmap(memory, kGuardSize + kStackSize);
    throw std::bad_alloc();
  }
}

}  // namespace

void LUMLogCrash::install() {
  static constinit rt::Lazy<bool> isInstalled;
  isInstalled.get([] {
    installHandlers();
    return true;
  });
  giveStack();
}
