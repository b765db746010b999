#include "Runtime/SystemLog/Private/Linux/Journal.h"

#include <fcntl.h>
#include <sys/mman.h>
#include <sys/uio.h>
#include <unistd.h>

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
  Fields() noexcept = default;
  Fields(const Fields&) = delete;
  Fields& operator=(const Fields&) = delete;

  // Adds a field. Precondition: there are fewer than `kMostFields` fields.
  void add(std::string_view name, std::string_view value) noexcept {
    copy(name);
    if (value.find('\n') == std::string_view::npos) {
      copy("=");
    } else {
      copy("\n");
      copyLength(value.size());
    }
    if (value.size() + kReserve <= kCapacity - used_) {
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

 private:
  static constexpr std::size_t kMostFields = 7;
  static constexpr std::size_t kCapacity = 2048;
  // Values leave this much of the buffer free, so that names, lengths and numbers can always be copied.
  static constexpr std::size_t kReserve = kMostFields * 48;

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
  std::size_t used_ = 0;
  std::size_t count_ = 0;
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
  Fields fields;
  fields.add("PRIORITY", static_cast<std::uint64_t>(severityOf(entry.type)));
  fields.add("TID", currentThreadIdentifier());
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
