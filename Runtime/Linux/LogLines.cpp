#include "Runtime/Linux/LogLines.h"

#include <poll.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <ctime>
#include <string>

#include "Runtime/Linux/LogSocket.h"

namespace rt::detail {

namespace {

constinit LogSocket syslogSocket("/dev/log");

/// Appends `text` with its control characters, which could end the line or command a terminal, written
/// out.
void appendReadable(std::string& line, std::string_view text) {
  constexpr std::string_view kDigits = "0123456789abcdef";
  for (const char character : text) {
    const auto code = static_cast<unsigned char>(character);
    if (code >= 0x20 && code != 0x7F) {
      line += character;
    } else if (character == '\n') {
      line += "\\n";
    } else if (character == '\t') {
      line += "\\t";
    } else {
      line.append("\\x").append(1, kDigits[code >> 4U]).append(1, kDigits[code & 0xFU]);
    }
  }
}

/// "[subsystem:category] text", as one line.
void appendBody(std::string& line, const LogEntry& entry) {
  if (!entry.subsystem.empty() || !entry.category.empty()) {
    line += '[';
    appendReadable(line, entry.subsystem);
    line += ':';
    appendReadable(line, entry.category);
    line += "] ";
  }
  appendReadable(line, entry.text);
}

/// "name[pid]", the name cut to what the classic daemons take.
std::string sender() {
  constexpr std::size_t kLongestName = 32;
  std::string text;
  appendReadable(text, std::string_view(program_invocation_short_name).substr(0, kLongestName));
  return text + '[' + std::to_string(getpid()) + ']';
}

/// How many bytes of `text` make a packet of at most `room`, with no character cut in two.
std::size_t packetLength(std::string_view text, std::size_t room) noexcept {
  if (text.size() <= room) return text.size();
  std::size_t length = room;
  while (length > 0 && (static_cast<unsigned char>(text[length]) & 0xC0U) == 0x80U) --length;
  return length > 0 ? length : room;
}

}  // namespace

Delivery writeToSyslog(const LogEntry& entry, const Patience& patience) {
  constexpr std::size_t kLongestPacket = 1024;
  constexpr int kUserFacility = 1 << 3;
  constexpr std::array<const char*, 12> kMonths = {"Jan", "Feb", "Mar", "Apr", "May", "Jun",
                                                   "Jul", "Aug", "Sep", "Oct", "Nov", "Dec"};
  const std::time_t now = std::time(nullptr);
  std::tm local{};
  localtime_r(&now, &local);
  std::array<char, 32> time{};
  // The names of months are English whatever the program's locale.
  const std::size_t timeLength = std::strftime(time.data(), time.size(), " %e %H:%M:%S ", &local);
  std::string packet = '<' + std::to_string(kUserFacility | severityOf(entry.type)) + '>';
  packet += kMonths.at(static_cast<std::size_t>(local.tm_mon));
  packet.append(time.data(), timeLength).append(sender()).append(": ");
  const std::size_t headLength = packet.size();

  std::string body;
  appendBody(body, entry);
  std::string_view rest = body;
  do {
    const std::size_t length = packetLength(rest, kLongestPacket - headLength);
    packet.resize(headLength);
    packet += rest.substr(0, length);
    rest.remove_prefix(length);
    iovec piece{packet.data(), packet.size()};
    msghdr message{};
    message.msg_iov = &piece;
    message.msg_iovlen = 1;
    const LogSocket::Outcome outcome = syslogSocket.send(message, patience);
    if (outcome == LogSocket::Outcome::absent) return Delivery::absent;
    if (outcome != LogSocket::Outcome::sent) return Delivery::refused;
  } while (!rest.empty());
  return Delivery::done;
}

Delivery writeToStandardError(const LogEntry& entry, const Patience& patience) {
  std::string line = sender();
  line.append(" ").append(nameOf(entry.type)).append(": ");
  appendBody(line, entry);
  line += '\n';

  // A file takes all of it at once. Anything else may make the writer wait, and may be without a reader;
  // what it says it has room for is a piece of this length.
  struct stat status{};
  const bool isFile = fstat(STDERR_FILENO, &status) == 0 && S_ISREG(status.st_mode);
  std::string_view rest = line;
  while (!rest.empty()) {
    if (!isFile) {
      pollfd stream{STDERR_FILENO, POLLOUT, 0};
      const int wait = patience.isOver() ? 0 : static_cast<int>(Patience::kWait.count());
      const int ready = poll(&stream, 1, wait);
      if (ready < 0 && errno == EINTR) continue;
      if (ready <= 0 || (stream.revents & POLLOUT) == 0 || (stream.revents & (POLLERR | POLLNVAL)) != 0) {
        return Delivery::refused;
      }
    }
    const std::size_t length = isFile ? rest.size() : std::min<std::size_t>(rest.size(), PIPE_BUF);
    const ssize_t count = write(STDERR_FILENO, rest.data(), length);
    if (count < 0 && errno == EINTR) continue;
    if (count <= 0) return Delivery::refused;
    rest.remove_prefix(static_cast<std::size_t>(count));
  }
  return Delivery::done;
}

}  // namespace rt::detail
