#include "Runtime/SystemLog/SystemLog.h"

#include <os/log.h>

#include <array>
#include <cerrno>
#include <string_view>

namespace rt {

namespace {

// The log cuts what an entry brings along at about 1 KiB.
constexpr std::size_t kLongestPiece = 960;

// The beginning of a text, as much as fits, with a NUL at its end. The log takes no other text. A NUL within
// the text becomes "\x00". No character is cut in two.
template <std::size_t longest>
class Piece {
 public:
  // Takes what fits from the beginning of `text` and removes it there.
  explicit Piece(std::string_view& text) noexcept {
    constexpr std::string_view kNUL = "\\x00";
    std::size_t taken = 0;
    std::size_t length = 0;
    // Where the last character began, in `text` and in the piece.
    std::size_t lastTaken = 0;
    std::size_t lastLength = 0;
    while (taken < text.size()) {
      if ((static_cast<unsigned char>(text[taken]) & 0xC0U) != 0x80U) {
        lastTaken = taken;
        lastLength = length;
      }
      const std::string_view next = text[taken] == '\0' ? kNUL : text.substr(taken, 1);
      if (length + next.size() > longest) {
        // Bytes that are no text may have no beginning of a character.
        if (lastTaken > 0) {
          taken = lastTaken;
          length = lastLength;
        }
        break;
      }
      length += next.copy(text_.data() + length, next.size());
      ++taken;
    }
    text_[length] = '\0';
    text.remove_prefix(taken);
  }

  const char* c_str() const noexcept { return text_.data(); }

 private:
  std::array<char, longest + 1> text_;
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

// The system keeps one object for each subsystem and category, so there is no need to keep it here.
os_log_t logOf(const String& subsystem, const String& category) noexcept {
  std::string_view subsystemText = subsystem.view();
  std::string_view categoryText = category.view();
  return os_log_create(Piece<255>(subsystemText).c_str(), Piece<255>(categoryText).c_str());
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

void SystemLog::write(Type type, std::string_view text) const noexcept {
  const ErrnoKept guard;
  const os_log_t log = logOf(subsystem_, category_);
  do {
    const Piece<kLongestPiece> piece(text);
    os_log_with_type(log, typeOf(type), "%{public}s", piece.c_str());
  } while (!text.empty());
}

std::uint64_t SystemLog::droppedCount() noexcept {
  return 0;
}

}  // namespace rt
