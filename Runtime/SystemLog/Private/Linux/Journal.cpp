#include "Runtime/SystemLog/Private/Linux/Journal.h"

#include <fcntl.h>
#include <sys/mman.h>
#include <sys/uio.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <charconv>
#include <cstring>
#include <span>

#include "Runtime/Locks/Private/ThreadIdentifier.h"
#include "Runtime/SystemLog/Private/Linux/LogSocket.h"

namespace rt::detail {

namespace {

constinit LogSocket journal("/run/systemd/journal/socket");

// The fields of an entry in the journal's format. A field is "NAME=value" and a line feed. A value with a
// line feed is written as NAME, a line feed, its length in 8 bytes, the value, and a line feed.
//
// Short values are copied into one buffer, so that most entries are one piece. Long values are not copied:
// they must outlive this object.
class Fields {
 public:
  // Makes an empty list for the entry's own fields and `extraCount` others, at most SystemLog::kMostFields.
  explicit Fields(std::size_t extraCount) noexcept : reserve_((kOwnFields + extraCount) * kLongestFrame) {}
  Fields(const Fields&) = delete;
  Fields& operator=(const Fields&) = delete;

  // Adds a field. Precondition: `name` has at most `kLongestName` bytes, and there is room for the field.
  void add(std::string_view name, std::string_view value) noexcept {
    copy(name);
    if (value.find('\n') == std::string_view::npos) {
      copy("=");
    } else {
      copy("\n");
      copyLength(value.size());
    }
    if (value.size() + reserve_ <= kCapacity - used_) {
      copy(value);
    } else {
      pieces_[count_++] = {const_cast<char*>(value.data()), value.size()};
    }
    copy("\n");
  }

  void add(std::string_view name, std::uint64_t value) noexcept {
    std::array<char, 20> digits{};
    const char* const end = std::to_chars(digits.data(), digits.data() + digits.size(), value).ptr;
    copy(name);
    copy("=");
    copy({digits.data(), end});
    copy("\n");
  }

  std::span<iovec> pieces() noexcept { return {pieces_.data(), count_}; }

  static constexpr std::size_t kLongestName = 64;

 private:
  static constexpr std::size_t kOwnFields = 7;
  static constexpr std::size_t kMostFields = kOwnFields + SystemLog::kMostFields;
  // What is copied of a field beside its value: the name, a line feed, the length, a line feed. A number
  // takes no more.
  static constexpr std::size_t kLongestFrame = kLongestName + 20 + 2;
  static constexpr std::size_t kCapacity = 2048 + kMostFields * kLongestFrame;

  void copyLength(std::uint64_t length) noexcept {
    std::array<char, 8> bytes{};
    for (char& byte : bytes) {
      byte = static_cast<char>(length & 0xFFU);
      length >>= 8U;
    }
    copy({bytes.data(), bytes.size()});
  }

  void copy(std::string_view bytes) noexcept {
    char* const place = buffer_.data() + used_;
    bytes.copy(place, bytes.size());
    used_ += bytes.size();
    if (count_ > 0) {
      iovec& last = pieces_[count_ - 1];
      if (static_cast<char*>(last.iov_base) + last.iov_len == place) {
        last.iov_len += bytes.size();
        return;
      }
    }
    pieces_[count_++] = {place, bytes.size()};
  }

  // Left uninitialised: clearing both would take longer than filling the part that is used.
  std::array<char, kCapacity> buffer_;
  std::array<iovec, 2 * kMostFields> pieces_;
  // Values leave this much of the buffer free, so that names, lengths and numbers can always be copied.
  const std::size_t reserve_;
  std::size_t used_ = 0;
  std::size_t count_ = 0;
};

// The name that a caller's field has in the journal.
class FieldName {
 public:
  explicit FieldName(std::string_view name) noexcept {
    append(name);
    if (name.empty() || !isLetter(place_[0]) || isTaken(text())) {
      length_ = 0;
      append("FIELD_");
      append(name);
    }
  }

  std::string_view text() const noexcept { return {place_.data(), length_}; }

 private:
  static bool isLetter(char character) noexcept { return character >= 'A' && character <= 'Z'; }
  static bool isDigit(char character) noexcept { return character >= '0' && character <= '9'; }
  static bool isTaken(std::string_view name) noexcept {
    constexpr std::array<std::string_view, 6> kTaken = {"PRIORITY",  "DROPPED",  "SYSLOG_IDENTIFIER",
                                                        "SUBSYSTEM", "CATEGORY", "MESSAGE"};
    return std::ranges::find(kTaken, name) != kTaken.end();
  }

  void append(std::string_view name) noexcept {
    for (const char given : name.substr(0, place_.size() - length_)) {
      const char upper = given >= 'a' && given <= 'z' ? static_cast<char>(given - 'a' + 'A') : given;
      place_[length_++] = isLetter(upper) || isDigit(upper) ? upper : '_';
    }
  }

  std::array<char, Fields::kLongestName> place_{};
  std::size_t length_ = 0;
};

bool writeAll(int file, std::span<iovec> pieces) noexcept {
  while (!pieces.empty()) {
    const ssize_t count = writev(file, pieces.data(), static_cast<int>(pieces.size()));
    if (count < 0 && errno == EINTR) continue;
    if (count <= 0) return false;
    auto written = static_cast<std::size_t>(count);
    while (!pieces.empty() && written >= pieces.front().iov_len) {
      written -= pieces.front().iov_len;
      pieces = pieces.subspan(1);
    }
    // A file in memory takes all of it, unless memory runs out in the middle of a page.
    if (!pieces.empty()) {
      pieces.front().iov_base = static_cast<char*>(pieces.front().iov_base) + written;
      pieces.front().iov_len -= written;
    }
  }
  return true;
}

// Sends an entry that is too large for a datagram, as a sealed file in memory.
LogSocket::Outcome sendAsFile(std::span<iovec> pieces, const Patience& patience) noexcept {
  const int file = memfd_create("journal-entry", MFD_CLOEXEC | MFD_ALLOW_SEALING);
  if (file < 0) return LogSocket::Outcome::busy;
  LogSocket::Outcome outcome = LogSocket::Outcome::busy;
  if (writeAll(file, pieces) &&
      fcntl(file, F_ADD_SEALS, F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_WRITE | F_SEAL_SEAL) == 0) {
    alignas(cmsghdr) std::array<char, CMSG_SPACE(sizeof file)> control{};
    msghdr message{};
    message.msg_control = control.data();
    message.msg_controllen = control.size();
    cmsghdr* const header = CMSG_FIRSTHDR(&message);
    header->cmsg_level = SOL_SOCKET;
    header->cmsg_type = SCM_RIGHTS;
    header->cmsg_len = CMSG_LEN(sizeof file);
    std::memcpy(CMSG_DATA(header), &file, sizeof file);
    outcome = journal.send(message, patience);
  }
  close(file);
  return outcome;
}

}  // namespace

Delivery writeToJournal(const LogEntry& entry, const Patience& patience) noexcept {
  const auto extra = entry.fields.first(std::min(entry.fields.size(), std::size_t{SystemLog::kMostFields}));
  Fields fields(extra.size());
  fields.add("PRIORITY", static_cast<std::uint64_t>(severityOf(entry.type)));
  bool hasThread = false;
  for (const SystemLog::Field& field : extra) {
    const FieldName name(field.name);
    hasThread = hasThread || name.text() == "TID";
    fields.add(name.text(), field.value);
  }
  if (!hasThread) fields.add("TID", currentThreadIdentifier());
  if (entry.dropped != 0) fields.add("DROPPED", entry.dropped);
  fields.add("SYSLOG_IDENTIFIER", program_invocation_short_name);
  fields.add("SUBSYSTEM", entry.subsystem);
  fields.add("CATEGORY", entry.category);
  fields.add("MESSAGE", entry.text);

  msghdr message{};
  message.msg_iov = fields.pieces().data();
  message.msg_iovlen = fields.pieces().size();
  LogSocket::Outcome outcome = journal.send(message, patience);
  if (outcome == LogSocket::Outcome::tooLarge) outcome = sendAsFile(fields.pieces(), patience);
  switch (outcome) {
    case LogSocket::Outcome::sent:
      return Delivery::done;
    case LogSocket::Outcome::absent:
      return Delivery::absent;
    case LogSocket::Outcome::busy:
    case LogSocket::Outcome::tooLarge:
      break;
  }
  return Delivery::refused;
}

}  // namespace rt::detail
