// Checks entries of the system's log as they leave the process. The journal gets a datagram, or a file if
// that would be too large. Both must parse back to the fields of the entry. The classic daemon must get the
// text with control characters escaped, in packets of bounded length that cut no character in two.
#include <fuzzer/FuzzedDataProvider.h>
#include <sys/socket.h>
#include <sys/uio.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cctype>
#include <cerrno>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "Runtime/Base/Private/UTF8.h"
#include "Runtime/Locks/Private/ThreadIdentifier.h"
#include "Runtime/SystemLog/Private/Linux/Journal.h"
#include "Runtime/SystemLog/Private/Linux/LogEntry.h"
#include "Runtime/SystemLog/Private/Linux/LogLines.h"
#include "Runtime/SystemLog/Private/Linux/Patience.h"

namespace {

using rt::detail::Delivery;
using rt::detail::LogEntry;

void require(bool condition) {
  if (!condition) std::abort();
}

// The daemon's end.
struct Daemon {
  // Longer datagrams are refused.
  std::size_t longestDatagram = 0;
  // How many bytes one write to a file takes.
  std::size_t longestWrite = 0;
  std::vector<std::string> received;
};
Daemon daemon_;

std::string joined(const iovec* pieces, std::size_t count) {
  std::string bytes;
  for (std::size_t i = 0; i < count; ++i) {
    bytes.append(static_cast<const char*>(pieces[i].iov_base), pieces[i].iov_len);
  }
  return bytes;
}

std::string contentOf(int file) {
  std::string content;
  std::array<char, 4096> part{};
  ssize_t count = 0;
  while ((count = pread(file, part.data(), part.size(), static_cast<off_t>(content.size()))) > 0) {
    content.append(part.data(), static_cast<std::size_t>(count));
  }
  return content;
}

}  // namespace

// These functions replace those of the C library.
extern "C" ssize_t sendmsg(int /*socket*/, const msghdr* message, int /*flags*/) {
  std::string bytes = joined(message->msg_iov, message->msg_iovlen);
  if (const cmsghdr* control = CMSG_FIRSTHDR(message); control != nullptr) {
    require(bytes.empty() && control->cmsg_type == SCM_RIGHTS);
    int file = -1;
    std::memcpy(&file, CMSG_DATA(control), sizeof file);
    daemon_.received.push_back(contentOf(file));
    return 0;
  }
  if (bytes.size() > daemon_.longestDatagram) {
    errno = EMSGSIZE;
    return -1;
  }
  const auto size = static_cast<ssize_t>(bytes.size());
  daemon_.received.push_back(std::move(bytes));
  return size;
}

extern "C" ssize_t writev(int file, const iovec* pieces, int count) {
  const std::string bytes = joined(pieces, static_cast<std::size_t>(count));
  return write(file, bytes.data(), std::min(bytes.size(), daemon_.longestWrite));
}

namespace {

using Fields = std::vector<std::pair<std::string, std::string>>;

// Parses what the journal was given, as the journal's documentation describes it.
Fields parsed(std::string_view bytes) {
  Fields fields;
  const auto take = [&bytes](std::size_t length) {
    require(length <= bytes.size());
    const std::string_view taken = bytes.substr(0, length);
    bytes.remove_prefix(length);
    return std::string(taken);
  };
  while (!bytes.empty()) {
    const std::size_t nameLength = bytes.find_first_of("=\n");
    require(nameLength != std::string_view::npos && nameLength > 0);
    std::string name = take(nameLength);
    std::size_t length = 0;
    if (take(1) == "=") {
      length = bytes.find('\n');
      require(length != std::string_view::npos);
    } else {
      const std::string size = take(8);
      for (std::size_t i = 8; i-- > 0;) length = length * 256 + static_cast<unsigned char>(size[i]);
    }
    std::string value = take(length);
    fields.emplace_back(std::move(name), std::move(value));
    require(take(1) == "\n");
  }
  return fields;
}

const char* severity(const LogEntry& entry) {
  using Type = rt::SystemLog::Type;
  return entry.type == Type::debug   ? "7"
         : entry.type == Type::info  ? "6"
         : entry.type == Type::error ? "3"
                                     : "2";
}

// The name that a field has in the journal, by the words of the contract.
std::string journalName(const std::string& given) {
  static constexpr std::array<const char*, 6> kTaken = {"PRIORITY",  "DROPPED",  "SYSLOG_IDENTIFIER",
                                                        "SUBSYSTEM", "CATEGORY", "MESSAGE"};
  std::string name;
  for (const char each : given) {
    const int upper = std::toupper(static_cast<unsigned char>(each));
    name += (upper >= 'A' && upper <= 'Z') || (upper >= '0' && upper <= '9') ? static_cast<char>(upper) : '_';
  }
  const bool isTaken = std::ranges::find(kTaken, name.substr(0, 64)) != kTaken.end();
  if (name.empty() || name[0] < 'A' || name[0] > 'Z' || isTaken) name.insert(0, "FIELD_");
  return name.substr(0, 64);
}

void checkJournal(const LogEntry& entry) {
  daemon_.received.clear();
  require(rt::detail::writeToJournal(entry, {}) == Delivery::done);
  require(daemon_.received.size() == 1);
  Fields expected{{"PRIORITY", severity(entry)}};
  bool hasThread = false;
  for (const rt::SystemLog::Field& field :
       entry.fields.first(std::min<std::size_t>(entry.fields.size(), 32))) {
    expected.emplace_back(journalName(std::string(field.name)), field.value);
    hasThread = hasThread || expected.back().first == "TID";
  }
  if (!hasThread) expected.emplace_back("TID", std::to_string(rt::currentThreadIdentifier()));
  if (entry.dropped != 0) expected.emplace_back("DROPPED", std::to_string(entry.dropped));
  expected.emplace_back("SYSLOG_IDENTIFIER", program_invocation_short_name);
  expected.emplace_back("SUBSYSTEM", entry.subsystem);
  expected.emplace_back("CATEGORY", entry.category);
  expected.emplace_back("MESSAGE", entry.text);
  require(parsed(daemon_.received.front()) == expected);
}

std::string readable(std::string_view text) {
  std::string result;
  for (const char each : text) {
    std::array<char, 8> code{};
    const int value = static_cast<unsigned char>(each);
    if (value < 32 || value == 127) {
      if (value == 9 || value == 10) {
        result += value == 9 ? "\\t" : "\\n";
      } else {
        std::snprintf(code.data(), code.size(), "\\x%02x", value);
        result += code.data();
      }
    } else {
      result += each;
    }
  }
  return result;
}

void checkSyslog(const LogEntry& entry) {
  daemon_.received.clear();
  daemon_.longestDatagram = 1024;
  require(rt::detail::writeToSyslog(entry, {}) == Delivery::done);
  const std::string name = std::string(program_invocation_short_name).substr(0, 32);
  const std::string sender = " " + readable(name) + "[" + std::to_string(getpid()) + "]: ";
  // The head is the priority, a time such as "Nov  2 12:34:56", and the sender.
  const std::string priority = "<" + std::to_string(8 + std::stoi(severity(entry))) + ">";
  const std::size_t headLength = priority.size() + 15 + sender.size();
  std::string expected = readable(entry.text);
  if (!entry.subsystem.empty() || !entry.category.empty()) {
    expected = "[" + readable(entry.subsystem) + ":" + readable(entry.category) + "] " + expected;
  }
  std::string body;
  for (const std::string& packet : daemon_.received) {
    require(packet.size() >= headLength && packet.starts_with(priority));
    require(packet.compare(headLength - sender.size(), sender.size(), sender) == 0);
    const std::string piece = packet.substr(headLength);
    require(!piece.empty() || expected.empty());
    require(rt::isValidUTF8(piece) || !rt::isValidUTF8(expected));
    body += piece;
  }
  require(body == expected);
  // A packet is shorter than the limit by at most the 3 bytes of an incomplete character.
  require(daemon_.received.size() <= expected.size() / (1024 - headLength - 3) + 1 ||
          !rt::isValidUTF8(expected));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t size) {
  FuzzedDataProvider data(bytes, size);
  using Type = rt::SystemLog::Type;
  LogEntry entry;
  entry.type = data.PickValueInArray({Type::debug, Type::info, Type::error, Type::fault});
  entry.dropped = data.ConsumeBool() ? data.ConsumeIntegral<std::uint64_t>() : 0;
  daemon_.longestDatagram = data.ConsumeIntegralInRange<std::size_t>(0, 300'000);
  daemon_.longestWrite = data.ConsumeIntegralInRange<std::size_t>(1000, 100'000);
  const std::size_t repetitions = data.ConsumeIntegralInRange<std::size_t>(1, 64);
  std::string program = data.ConsumeRandomLengthString(60);
  std::erase(program, '\0');
  std::string subsystem = data.ConsumeRandomLengthString(100);
  const std::string category = data.ConsumeRandomLengthString(100);
  std::vector<std::pair<std::string, std::string>> given(data.ConsumeIntegralInRange<std::size_t>(0, 40));
  for (auto& [name, value] : given) {
    name = data.ConsumeRandomLengthString(80);
    value = data.ConsumeRandomLengthString(100);
    if (data.ConsumeBool()) value.append(repetitions * 100, 'v');
  }
  std::vector<rt::SystemLog::Field> fields;
  for (const auto& [name, value] : given) fields.push_back({name, value});
  const std::string part = data.ConsumeRemainingBytesAsString();
  std::string text;
  for (std::size_t i = 0; i < repetitions; ++i) text += part;
  // The subsystem may also be the value that is too long to be copied.
  if (repetitions % 3 == 0) std::swap(subsystem, text);
  entry.subsystem = subsystem;
  entry.category = category;
  entry.text = text;
  entry.fields = fields;

  char* const before = program_invocation_short_name;
  program_invocation_short_name = program.data();
  checkJournal(entry);
  checkSyslog(entry);
  program_invocation_short_name = before;
  return 0;
}
