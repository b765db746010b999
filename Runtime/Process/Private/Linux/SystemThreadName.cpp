#include "Runtime/Process/Private/SystemThreadName.h"

#include <fcntl.h>
#include <sys/prctl.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <string_view>

#include "Runtime/Base/Private/UTF8.h"
#include "Runtime/Locks/Private/Lazy.h"

namespace rt::detail {

namespace {

// The kernel keeps 15 bytes and a NUL.
constexpr std::size_t kCapacity = 16;
using Text = std::array<char, kCapacity>;

// Returns the name of the main thread, which is also the name of the process.
Text processName() noexcept {
  Text text{};
  const int file = open("/proc/self/comm", O_RDONLY | O_CLOEXEC);
  if (file < 0) {
    // The kernel nearly always takes the process's name from this one.
    std::string_view(program_invocation_short_name).copy(text.data(), kCapacity - 1);
    return text;
  }
  const ssize_t length = read(file, text.data(), text.size());
  close(file);
  // The kernel ends the name with a line feed.
  text[length > 0 ? static_cast<std::size_t>(length) - 1 : 0] = '\0';
  return text;
}

// Returns the name that the process had before any thread was named here. Naming the main thread renames the
// process.
const Text& firstProcessName() noexcept {
  static constinit Lazy<Text> name;
  return name.get(processName);
}

}  // namespace

// A new thread has its creator's name in the system, and the main thread has the process's. So the system's
// name does not tell whether anybody gave it to this thread.
String systemThreadName() {
  return nullptr;
}

void setSystemThreadName(const String& name) noexcept {
  const Text& unnamed = firstProcessName();
  const std::string_view text = name.isNull() ? std::string_view(unnamed.data()) : name.view();
  Text shortened{};
  text.copy(shortened.data(), lengthThatFits(text, kCapacity - 1));
  prctl(PR_SET_NAME, shortened.data());
}

}  // namespace rt::detail
