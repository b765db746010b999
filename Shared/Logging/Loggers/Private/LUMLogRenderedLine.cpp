#include "Shared/Logging/Loggers/Private/LUMLogRenderedLine.h"

#include <algorithm>
#include <span>

#include "Shared/Logging/Loggers/LUMLogLine.h"
#include "Shared/Logging/Loggers/LUMLogLineFormatter.h"

// NOLINTNEXTLINE(cppcoreguidelines-pro-type-member-init): see the member
LUMLogRenderedLine::LUMLogRenderedLine(const LUMLogFormatter& formatter, const LUMLogMessage& message,
                                       std::string_view end) {
  const auto* const lineFormatter = rt::cast<LUMLogLineFormatter>(&formatter);
  rt::String string;
  if (lineFormatter == nullptr) {
    string = formatter.formattedLogMessage(message);
    if (!string) return;
  }
  const auto render = [&](std::span<char> place) {
    LUMLogLine line(place);
    if (lineFormatter != nullptr) {
      lineFormatter->appendLine(line, message);
    } else {
      line.append(string.view());
    }
    line.append(end);
    text_ = line.text();
    if (!line.isComplete() && place.size() >= end.size()) {
      std::ranges::copy(end, place.last(end.size()).begin());
    }
    return line.length();
  };
  std::size_t length = render(place_);
  // A description may be longer each time, so that a second rendering need not fit either.
  if (length > place_.size()) {
    longPlace_ = std::make_unique_for_overwrite<char[]>(length);
    render({longPlace_.get(), length});
  }
}
