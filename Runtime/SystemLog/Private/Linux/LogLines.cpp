#include "Runtime/SystemLog/Private/Linux/LogLines.h"

#include <unistd.h>

#include <array>
#include <cerrno>
#include <chrono>
#include <ctime>
#include <string>

#include "Runtime/Base/Private/StandardError.h"
#include "Runtime/Base/Private/UTF8.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/SystemLog/Private/Linux/LogSocket.h"

namespace rt::detail {

namespace {

constinit LogSocket syslogSocket("/dev/log");

// Appends `text` with its control characters escaped. They could end the line or control a terminal.
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

// Appends "[subsystem:category] text" as one line.
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

// Returns "name[pid]". The name is cut to the length that classic daemons accept.
std::string sender() {
  constexpr std::size_t kLongestName = 32;
  std::string text;
  appendReadable(text, std::string_view(program_invocation_short_name).substr(0, kLongestName));
  return text + '[' + std::to_string(getpid()) + ']';
}

}  // namespace

Delivery writeToSyslog(const LogEntry& entry, const Patience& patience) {
  constexpr std::size_t kLongestPacket = 1024;
  constexpr int kUserFacility = 1 << 3;
  constexpr std::array<const char*, 12> kMonths = {"Jan", "Feb", "Mar", "Apr", "May", "Jun",
                                                   "Jul", "Aug", "Sep", "Oct", "Nov", "Dec"};
  const std::time_t now = std::time(nullptr);
  std::tm local{};
  {
    // `localtime_r` has a lock of its own. A fork waits for our lock, so that its child never gets the other
    // one locked.
    static constinit UnfairLock lock;
    const LockGuard guard(lock);
    localtime_r(&now, &local);
  }
  std::array<char, 32> time{};
  // Daemons expect English names of months. `strftime` would write them in the program's locale.
  const std::size_t timeLength = std::strftime(time.data(), time.size(), " %e %H:%M:%S ", &local);
  std::string packet = '<' + std::to_string(kUserFacility | severityOf(entry.type)) + '>';
  packet += kMonths.at(static_cast<std::size_t>(local.tm_mon));
  packet.append(time.data(), timeLength).append(sender()).append(": ");
  const std::size_t headLength = packet.size();

  std::string body;
  appendBody(body, entry);
  std::string_view rest = body;
  do {
    const std::size_t length = lengthThatFits(rest, kLongestPacket - headLength);
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

  const auto wait = patience.isOver() ? std::chrono::milliseconds(0) : Patience::kWait;
  return StandardError::write(line, wait) ? Delivery::done : Delivery::refused;
}

}  // namespace rt::detail
