// Writes messages with any texts and fields as lines of JSON, and reads them back with a simple reader that
// refuses what the grammar of JSON does not allow. The line must have the same texts and fields, each name
// once, and no control characters. In a signal handler, the line must be JSON in a place of any size.
#include <fuzzer/FuzzedDataProvider.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "Runtime/Base/Private/UTF8.h"
#include "Runtime/Values/Dictionary.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMLogMessage.h"
#include "Shared/Logging/Loggers/LUMLogJSON.h"

namespace {

using rt::Ref;

void require(bool condition) {
  if (!condition) std::abort();
}

// The values of an object by their paths: "Attributes/user". A string has a quote before it, everything else
// is as it stands in the line.
using Values = std::map<std::string, std::string>;

class Reader {
 public:
  explicit Reader(std::string_view text) : text_(text) {}

  Values read() {
    object("");
    require(text_.empty());
    return values_;
  }

 private:
  char take() {
    require(!text_.empty());
    const char first = text_.front();
    text_.remove_prefix(1);
    return first;
  }
  bool takes(char expected) {
    if (text_.empty() || text_.front() != expected) return false;
    text_.remove_prefix(1);
    return true;
  }

  void object(const std::string& path) {
    require(take() == '{');
    do {
      std::string name = path;
      name += string();
      require(take() == ':');
      value(name);
    } while (takes(','));
    require(take() == '}');
  }

  void value(const std::string& path) {
    require(!text_.empty());
    if (text_.front() == '{') return object(path + '/');
    std::string found;
    if (text_.front() == '"') {
      found = '"' + string();
    } else {
      const std::size_t length = std::min(text_.find_first_of(",}"), text_.size());
      found = text_.substr(0, length);
      text_.remove_prefix(length);
      if (found != "true" && found != "false" && found != "null") checkNumber(found);
    }
    require(values_.emplace(path, found).second);
  }

  static void checkNumber(std::string_view number) {
    const auto digits = [&number] {
      const std::size_t count = std::min(number.find_first_not_of("0123456789"), number.size());
      require(count > 0);
      number.remove_prefix(count);
      return count;
    };
    const auto takes = [&number](std::string_view allowed) {
      const bool isThere = !number.empty() && allowed.find(number.front()) != std::string_view::npos;
      if (isThere) number.remove_prefix(1);
      return isThere;
    };
    takes("-");
    const bool beginsWithZero = number.starts_with('0');
    require(digits() == 1 || !beginsWithZero);
    if (takes(".")) digits();
    if (takes("e")) {
      takes("+-");
      digits();
    }
    require(number.empty());
  }

  std::string string() {
    require(take() == '"');
    std::string found;
    for (;;) {
      const char next = take();
      require(static_cast<unsigned char>(next) >= 0x20 && next != '\x7F');
      if (next == '"') return found;
      if (next != '\\') {
        found += next;
        continue;
      }
      switch (take()) {
        case '"':
          found += '"';
          break;
        case '\\':
          found += '\\';
          break;
        case 'n':
          found += '\n';
          break;
        case 'r':
          found += '\r';
          break;
        case 't':
          found += '\t';
          break;
        case 'u': {
          char32_t unit = 0;
          for (int i = 0; i < 4; ++i) {
            const std::size_t digit = std::string_view("0123456789abcdef").find(take());
            require(digit != std::string_view::npos);
            unit = unit << 4U | static_cast<char32_t>(digit);
          }
          char bytes[rt::kMaximumUTF8Length];
          found.append(bytes, rt::encodeUTF8(unit, bytes));
          break;
        }
        default:
          std::abort();
      }
    }
  }

  std::string_view text_;
  Values values_;
};

rt::String someText(FuzzedDataProvider& data) {
  return rt::String::fromUTF8Repaired(data.ConsumeRandomLengthString(40));
}

std::string lineOf(const LUMLogJSON& json, const LUMLogMessage& message, std::size_t size,
                   LUMLogLine::Caller caller) {
  std::string place(size, '\0');
  LUMLogLine line(place, caller);
  json.appendLine(line, message);
  require(line.isComplete());
  return std::string(line.text());
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t size) {
  FuzzedDataProvider data(bytes, size);
  const rt::String body = someText(data);
  const rt::String file = someText(data);
  const auto level = data.ConsumeIntegralInRange<LUMLogLevel>(0, 8);
  const auto place = data.ConsumeIntegralInRange<std::size_t>(128, 2000);
  rt::Dictionary::Builder fields;
  Values expected;
  while (data.remaining_bytes() > 0) {
    const rt::String name = data.ConsumeBool() ? someText(data) : rt::String::fromUTF8("thread.id");
    // Others than those of spans, and of the predefined keys.
    if (name.view() == "trace.id" || name.view() == "span.id" || name.hasPrefix("LUMLogMetadata")) continue;
    std::string& value = expected["Attributes/" + std::string(name.view())];
    if (data.ConsumeBool()) {
      const rt::String text = someText(data);
      fields.set(name, text);
      value = '"' + std::string(text.view());
    } else if (data.ConsumeBool()) {
      const auto number = data.ConsumeIntegral<std::int64_t>();
      fields.set(name, rt::Number::of(number));
      const bool isSmall = number > -(std::int64_t{1} << 53) && number < std::int64_t{1} << 53;
      value = (isSmall ? "" : "\"") + std::to_string(number);
    } else {
      fields.set(name, rt::Number::of(data.ConsumeFloatingPoint<double>()));
      value.clear();
    }
  }
  const Ref<LUMLogMessage> message =
      LUMLogMessage::initWithLevel(level, body, body, file, nullptr, 0, nullptr, nullptr, nullptr, nullptr,
                                   LUMLogMetadata::initWithProperties(std::move(fields).dictionary()));

  const Ref<LUMLogJSON> json = LUMLogJSON::init();
  const std::string line = lineOf(*json, *message, 64 * 1024 + 20 * size, LUMLogLine::Caller::kThread);
  const Values values = Reader(line).read();
  require(values.at("Body") == '"' + std::string(body.view()));
  for (const auto& [path, value] : expected) {
    const auto found = values.find(path);
    require(found != values.end() && (value.empty() || found->second == value));
  }
  if (!file.isEmpty() && !expected.contains("Attributes/code.file.path"))
    require(values.at("Attributes/code.file.path") == '"' + std::string(file.view()));

  const std::string cut = lineOf(*json, *message, place, LUMLogLine::Caller::kSignalHandler);
  if (line.size() < place) {
    require(cut == line);
  } else {
    const std::string text = Reader(cut).read().at("Body");
    require(values.at("Body").starts_with(text));
  }
  return 0;
}
