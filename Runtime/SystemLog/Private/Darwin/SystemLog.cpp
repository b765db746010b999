#include "Runtime/SystemLog/SystemLog.h"

#include <os/log.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <string_view>

#include "Runtime/Base/Private/UTF8.h"

namespace rt {

namespace {

// The log cuts what an entry brings along at about 1 KiB.
constexpr std::size_t kLongestEntry = 960;
constexpr std::size_t kLongestName = 255;

// The text that the log takes ends with NUL. A NUL within the text becomes a space.
template <std::size_t capacity>
class EndedText {
 public:
  // Precondition: `text` has `capacity` bytes at most.
  explicit EndedText(std::string_view text) noexcept {
    const auto end = std::ranges::replace_copy(text, text_.begin(), '\0', ' ').out;
    *end = '\0';
  }

  const char* begin() const noexcept { return text_.data(); }

 private:
  std::array<char, capacity + 1> text_;
};

// Keeps `errno` as it is.
class ErrnoKept {
 public:
  ErrnoKept() noexcept = default;
  ErrnoKept(const ErrnoKept&) = delete;
  ErrnoKept& operator=(const ErrnoKept&) = delete;
  ~ErrnoKept() { errno = error_; }

 private:
  int error_ = errno;
};

EndedText<kLongestName> nameOf(const String& name) noexcept {
  const std::string_view text = name.view();
  return EndedText<kLongestName>(text.substr(0, lengthThatFits(text, kLongestName)));
}

// The system keeps one object for each subsystem and category, so there is no need to keep it here.
os_log_t logOf(const String& subsystem, const String& category) noexcept {
  return os_log_create(nameOf(subsystem).begin(), nameOf(category).begin());
}

os_log_type_t typeOf(SystemLog::Type type) noexcept {
  switch (type) {
    case SystemLog::Type::debug:
      return OS_LOG_TYPE_DEBUG;
    case SystemLog::Type::info:
      return OS_LOG_TYPE_INFO;
    case SystemLog::Type::error:
      return OS_LOG_TYPE_ERROR;
    case SystemLog::Type::fault:
      break;
  }
  return OS_LOG_TYPE_FAULT;
}

}  // namespace

bool SystemLog::isEnabled(Type type) const noexcept {
  const ErrnoKept guard;
  return os_log_type_enabled(logOf(subsystem_, category_), typeOf(type));
}

void SystemLog::write(Type type, std::string_view text, std::span<const Field> /*fields*/) const noexcept {
  const ErrnoKept guard;
  const os_log_t log = logOf(subsystem_, category_);
  do {
    const std::size_t length = lengthThatFits(text, kLongestEntry);
    const EndedText<kLongestEntry> entry(text.substr(0, length));
    os_log_with_type(log, typeOf(type), "%{public}s", entry.begin());
    text.remove_prefix(length);
  } while (!text.empty());
}

std::uint64_t SystemLog::droppedCount() noexcept {
  return 0;
}

}  // namespace rt
