#include "Shared/Logging/Loggers/LUMTerminalLogger.h"

#include <sys/select.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <chrono>
#include <cstdlib>
#include <cstring>
#include <span>
#include <stdexcept>
#include <string>
#include <utility>

#include "Runtime/Base/Private/StandardError.h"
#include "Shared/Logging/Loggers/LUMLogLine.h"
#include "Shared/Logging/Loggers/LUMLogLineFormatter.h"
#include "Shared/Logging/Loggers/LUMLogPattern.h"
#include "Shared/Logging/Loggers/Private/LUMLogLoss.h"
#include "Shared/Logging/Loggers/Private/LUMLogRenderedLine.h"

namespace {

constexpr std::chrono::seconds kLongestWait{1};
constexpr std::string_view kUncoloured = "\x1B[0m";

std::string_view colourOf(LUMLogLevel level) noexcept {
  if (level < LUMLogLevelInfo) return "\x1B[2m";
  if (level == LUMLogLevelInfo) return "";
  return level == LUMLogLevelError ? "\x1B[31m" : "\x1B[1;31m";
}

std::string_view variable(const char* name) noexcept {
  const char* const value = std::getenv(name);
  return value != nullptr ? value : "";
}

bool areColoursWanted(const LUMTerminalLoggerOptions& options) noexcept {
  if (options.colours != LUMTerminalColours::kAutomatic)
    return options.colours == LUMTerminalColours::kAlways;
  const std::string_view terminal = variable("TERM");
  return isatty(options.descriptor) == 1 && variable("NO_COLOR").empty() && !terminal.empty() &&
         terminal != "dumb";
}

rt::Ref<LUMLogFormatter> formatterOf(const LUMTerminalLoggerOptions& options) {
  if (options.formatter != nullptr) return options.formatter;
  return LUMLogPattern::init();
}

}  // namespace

rt::Ref<LUMTerminalLogger> LUMTerminalLogger::init(LUMTerminalLoggerOptions options) {
  if (options.descriptor < 0 || options.descriptor >= FD_SETSIZE) {
    throw std::invalid_argument("the descriptor " + std::to_string(options.descriptor) +
                                " is not between 0 and " + std::to_string(FD_SETSIZE - 1));
  }
  return rt::Ref<LUMTerminalLogger>::adopt(new LUMTerminalLogger(std::move(options)));
}

LUMTerminalLogger::LUMTerminalLogger(LUMTerminalLoggerOptions options)
    : Implements(std::move(options.filter)),
      formatter_(formatterOf(options)),
      lineFormatter_(rt::cast<LUMLogLineFormatter>(formatter_.get())),
      descriptor_(options.descriptor),
      usesColours_(areColoursWanted(options)) {}

void LUMTerminalLogger::logWithMessage(const rt::Ref<LUMLogMessage>& message) {
  if (untoldCount_.load(std::memory_order_relaxed) > 0) [[unlikely]] {
    const std::uint64_t count = untoldCount_.exchange(0, std::memory_order_relaxed);
    bool isTold = count == 0;
    try {
      isTold = isTold || writeMessage(*LUMLogLossMessage(count, error_.load(std::memory_order_relaxed)));
    } catch (...) {
      untoldCount_.fetch_add(count, std::memory_order_relaxed);
      throw;
    }
    if (!isTold) untoldCount_.fetch_add(count, std::memory_order_relaxed);
  }
  if (writeMessage(*message)) return;
  droppedCount_.fetch_add(1, std::memory_order_relaxed);
  untoldCount_.fetch_add(1, std::memory_order_relaxed);
}

// Returns false if the line was lost.
bool LUMTerminalLogger::writeMessage(const LUMLogMessage& message) {
  const LUMLogRenderedLine line(*formatter_, message, "\n");
  const std::string_view text = line.text();
  const std::string_view colour = usesColours_ ? colourOf(message.level()) : "";
  if (text.empty() || colour.empty()) return write(text);
  std::string coloured;
  coloured.reserve(colour.size() + text.size() + kUncoloured.size());
  coloured += colour;
  coloured += text.substr(0, text.size() - 1);
  coloured += kUncoloured;
  coloured += '\n';
  return write(coloured);
}

bool LUMTerminalLogger::write(std::string_view line) noexcept {
  if (line.empty()) return true;
  const rt::LockGuard guard(lock_);
  const std::chrono::milliseconds wait = isStuck_ ? std::chrono::milliseconds(0) : kLongestWait;
  if (isCut_) isCut_ = rt::StandardError::writeTo(descriptor_, "\n", wait) == 0;
  const std::size_t written = isCut_ ? 0 : rt::StandardError::writeTo(descriptor_, line, wait);
  isStuck_ = written < line.size();
  if (isStuck_) {
    error_.store(errno, std::memory_order_relaxed);
    isCut_ = isCut_ || written > 0;
  }
  return !isStuck_;
}

void LUMTerminalLogger::logInSignalHandler(const LUMLogMessage& message) noexcept {
  const int error = errno;
  std::array<char, 4096> place;  // NOLINT(cppcoreguidelines-pro-type-member-init): filled below
  const std::span<char> all(place);
  const std::string_view colour = usesColours_ ? colourOf(message.level()) : "";
  LUMLogLine line(all.first(all.size() - kUncoloured.size() - 1), LUMLogLine::Caller::kSignalHandler);
  line.append(colour);
  if (lineFormatter_ != nullptr) {
    lineFormatter_->appendLine(line, message);
  } else {
    line.appendEscaped(message.formattedString().view());
  }
  const std::size_t length = line.text().size();
  LUMLogLine end(all.subspan(length), LUMLogLine::Caller::kSignalHandler);
  if (!colour.empty()) end.append(kUncoloured);
  end.append('\n');
  // Many messages may wait, so only the first that finds no room waits for it.
  const std::chrono::milliseconds wait =
      isStuckInHandler_.load(std::memory_order_relaxed) ? std::chrono::milliseconds(0) : kLongestWait;
  const std::size_t size = length + end.length();
  const bool isStuck = rt::StandardError::writeTo(descriptor_, {place.data(), size}, wait) < size;
  isStuckInHandler_.store(isStuck, std::memory_order_relaxed);
  errno = error;
}
