#include "Shared/Logging/Loggers/LUMFileLogger.h"

#include <array>
#include <span>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>

#include "Shared/Logging/Loggers/LUMLogLine.h"
#include "Shared/Logging/Loggers/LUMLogLineFormatter.h"
#include "Shared/Logging/Loggers/LUMLogPattern.h"
#include "Shared/Logging/Loggers/Private/LUMLogFileBuffer.h"
#include "Shared/Logging/Loggers/Private/LUMLogFlusher.h"
#include "Shared/Logging/Loggers/Private/LUMLogLoss.h"
#include "Shared/Logging/Loggers/Private/LUMLogRenderedLine.h"

namespace {

void check(const LUMFileLoggerOptions& options) {
  constexpr std::uint32_t kMostFiles = 1000;
  constexpr std::uint32_t kAllPermissions = 0777;
  if (options.keptFileCount > kMostFiles) throw std::invalid_argument("keptFileCount is at most 1000");
  if (options.longestDelayInMilliseconds == 0) {
    throw std::invalid_argument("longestDelayInMilliseconds is at least 1");
  }
  if (options.mode > kAllPermissions) throw std::invalid_argument("mode is at most 0777");
}

rt::Ref<LUMLogFormatter> formatterOf(const LUMFileLoggerOptions& options) {
  if (options.formatter != nullptr) return options.formatter;
  return LUMLogPattern::init();
}

}  // namespace

rt::Ref<LUMFileLogger> LUMFileLogger::initWithPath(const rt::String& path,
                                                   const LUMFileLoggerOptions& options) {
  check(options);
  return rt::Ref<LUMFileLogger>::adopt(new LUMFileLogger(path, options));
}

rt::Ref<LUMFileLogger> LUMFileLogger::initWithPath(const rt::String& path, rt::Ref<LUMLogFormatter> formatter,
                                                   rt::Ref<LUMLogFilter> filter) {
  LUMFileLoggerOptions options;
  options.formatter = std::move(formatter);
  options.filter = std::move(filter);
  return initWithPath(path, options);
}

LUMFileLogger::LUMFileLogger(const rt::String& path, const LUMFileLoggerOptions& options)
    : Implements(options.filter),
      formatter_(formatterOf(options)),
      lineFormatter_(rt::cast<LUMLogLineFormatter>(formatter_.get())),
      buffer_(rt::make<LUMLogFileBuffer>(std::string(path.view()), options)) {
  if (buffer_->isBuffered()) LUMLogFlusher::shared().add(buffer_);
}

LUMFileLogger::~LUMFileLogger() {
  if (buffer_->isBuffered()) LUMLogFlusher::shared().remove(buffer_.get());
  buffer_->flush(~std::uint32_t{0});
}

void LUMFileLogger::logWithMessage(const rt::Ref<LUMLogMessage>& message) {
  const LUMLogRenderedLine line(*formatter_, *message, "\n");
  if (line.text().empty()) return;
  tellLoss();
  buffer_->append(line.text(), message->time(), message->level() >= LUMLogLevelError);
}

// Appends a line about the lines that were lost, if there are any.
void LUMFileLogger::tellLoss() {
  const std::uint64_t count = buffer_->takeUntoldCount();
  if (count == 0) [[likely]]
    return;
  try {
    const rt::Ref<LUMLogMessage> loss = LUMLogLossMessage(count, buffer_->error());
    const LUMLogRenderedLine notice(*formatter_, *loss, "\n");
    if (notice.text().empty()) {
      buffer_->giveBackUntoldCount(count);
      return;
    }
    buffer_->appendNotice(notice.text(), count, loss->time());
  } catch (...) {
    buffer_->giveBackUntoldCount(count);
    throw;
  }
}

bool LUMFileLogger::flush(std::uint32_t milliseconds) {
  tellLoss();
  return buffer_->flush(milliseconds);
}

void LUMFileLogger::rotate() {
  buffer_->rotate();
}

std::uint64_t LUMFileLogger::droppedCount() const noexcept {
  return buffer_->droppedCount();
}

void LUMFileLogger::logInSignalHandler(const LUMLogMessage& message) noexcept {
  std::array<char, 4096> place;  // NOLINT(cppcoreguidelines-pro-type-member-init): filled below
  LUMLogLine line(std::span<char>(place).first(place.size() - 1), LUMLogLine::Caller::kSignalHandler);
  if (lineFormatter_ != nullptr) {
    lineFormatter_->appendLine(line, message);
  } else {
    line.appendEscaped(message.formattedString().view());
  }
  const std::size_t length = line.text().size();
  place[length] = '\n';
  buffer_->writeInSignalHandler({place.data(), length + 1});
}
