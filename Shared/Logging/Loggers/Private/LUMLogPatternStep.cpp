#include "Shared/Logging/Loggers/Private/LUMLogPatternStep.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <stdexcept>
#include <utility>

namespace {

using Step = LUMLogPatternStep;
using Kind = Step::Kind;

constexpr std::pair<std::string_view, Kind> kFields[] = {
    {"time", Kind::kTime},         {"utc", Kind::kUtc},
    {"level", Kind::kLevel},       {"component", Kind::kComponent},
    {"category", Kind::kCategory}, {"thread", Kind::kThread},
    {"tid", Kind::kTid},           {"queue", Kind::kQueue},
    {"file", Kind::kFile},         {"path", Kind::kPath},
    {"line", Kind::kLine},         {"function", Kind::kFunction},
    {"text", Kind::kText},         {"fields", Kind::kFields},
    {"stack", Kind::kStack}};

constexpr std::string_view kDefaultTime = "%Y-%m-%d %H:%M:%S.%3f";
constexpr std::string_view kDefaultUtc = "%Y-%m-%dT%H:%M:%S.%3fZ";

// Returns how many letters differ: one that is missing, added, replaced or swapped with the next counts 1.
std::size_t distance(std::string_view first, std::string_view second) {
  std::vector<std::vector<std::size_t>> table(first.size() + 1, std::vector<std::size_t>(second.size() + 1));
  for (std::size_t i = 0; i <= first.size(); ++i) {
    for (std::size_t j = 0; j <= second.size(); ++j) {
      if (i == 0 || j == 0) {
        table[i][j] = i + j;
        continue;
      }
      const std::size_t replaced = table[i - 1][j - 1] + (first[i - 1] == second[j - 1] ? 0 : 1);
      table[i][j] = std::min({table[i - 1][j] + 1, table[i][j - 1] + 1, replaced});
      if (i > 1 && j > 1 && first[i - 1] == second[j - 2] && first[i - 2] == second[j - 1]) {
        table[i][j] = std::min(table[i][j], table[i - 2][j - 2] + 1);
      }
    }
  }
  return table.back().back();
}

// Reads a pattern from its beginning to its end.
class Parser {
 public:
  explicit Parser(std::string_view pattern) noexcept : pattern_(pattern) {}

  std::vector<Step> steps() && {
    while (position_ < pattern_.size()) {
      const char character = pattern_[position_];
      if (character != '{' && character != '}') {
        checkLiteral(position_);
        appendLiteral(character);
        ++position_;
      } else if (position_ + 1 < pattern_.size() && pattern_[position_ + 1] == character) {
        appendLiteral(character);
        position_ += 2;
      } else if (character == '}') {
        fail(position_, "this '}' ends no field; write '}}' for a brace");
      } else {
        parseField();
      }
    }
    return std::move(steps_);
  }

 private:
  [[noreturn]] static void fail(std::size_t position, const std::string& reason) {
    throw std::invalid_argument("column " + std::to_string(position + 1) + ": " + reason);
  }

  void checkLiteral(std::size_t position) const {
    const auto code = static_cast<unsigned char>(pattern_[position]);
    if ((code < 0x20 && code != '\t') || code == 0x7F) {
      fail(position, "a control character; a message is one line");
    }
  }

  void appendLiteral(char character) {
    if (steps_.empty() || steps_.back().kind != Kind::kLiteral) steps_.emplace_back();
    steps_.back().text += character;
  }

  // Removes the space that ends the steps, and returns it.
  std::string takeSpace() {
    if (steps_.empty() || steps_.back().kind != Kind::kLiteral || !steps_.back().text.ends_with(' '))
      return "";
    steps_.back().text.pop_back();
    return " ";
  }

  void parseField() {
    const std::size_t start = position_;
    const std::size_t end = pattern_.find_first_of("{}", start + 1);
    if (end == std::string_view::npos || pattern_[end] == '{') {
      fail(start, "this '{' has no '}'; write '{{' for a brace");
    }
    for (std::size_t i = start; i < end; ++i) checkLiteral(i);
    const std::string_view field = pattern_.substr(start + 1, end - start - 1);
    const std::size_t nameLength = std::min(field.find(':'), field.size());
    const bool hasOption = nameLength < field.size();
    const std::size_t optionPosition = start + 1 + nameLength + 1;
    const std::string_view option = hasOption ? field.substr(nameLength + 1) : std::string_view();

    const Kind kind = kindOf(field.substr(0, nameLength), start);
    const bool mayTakeSpace = (kind == Kind::kFields || kind == Kind::kStack) && !hasOption;
    std::string before = mayTakeSpace ? takeSpace() : std::string();
    Step& step = steps_.emplace_back();
    step.kind = kind;
    step.text = std::move(before);
    if (step.kind == Kind::kTime || step.kind == Kind::kUtc) {
      step.timeIndex = timeCount_++;
      const std::string_view usual = step.kind == Kind::kTime ? kDefaultTime : kDefaultUtc;
      parseTime(step, hasOption ? option : usual, optionPosition);
    } else if (hasOption) {
      parseWidth(step, option, optionPosition);
    }
    position_ = end + 1;
  }

  static Kind kindOf(std::string_view name, std::size_t position) {
    const auto* const known = std::ranges::find(kFields, name, &std::pair<std::string_view, Kind>::first);
    if (known != std::end(kFields)) return known->second;
    if (name.empty()) fail(position, "a field without a name; a field is for example {text}");
    std::string reason = "there is no field '" + std::string(name) + "'; ";
    constexpr std::size_t kFarthest = 2;
    constexpr std::size_t kLongestName = 32;
    if (name.size() <= kLongestName) {
      const auto* const nearest =
          std::ranges::min_element(kFields, {}, [&](const auto& each) { return distance(name, each.first); });
      if (distance(name, nearest->first) <= kFarthest) {
        fail(position, reason + "do you mean '" + std::string(nearest->first) + "'?");
      }
    }
    reason += "there are";
    for (const auto& each : kFields) {
      reason += each.second == kFields->second ? " " : ", ";
      reason += each.first;
    }
    fail(position, reason);
  }

  static void parseWidth(Step& step, std::string_view option, std::size_t position) {
    unsigned width = 0;
    const char* const end = option.data() + option.size();
    const bool isAligned = !option.empty() && (option.front() == '<' || option.front() == '>');
    const auto result = isAligned && option.size() > 1 && option[1] != '0'
                            ? std::from_chars(option.data() + 1, end, width)
                            : std::from_chars_result{option.data(), std::errc::invalid_argument};
    if (result.ec == std::errc::invalid_argument || result.ptr != end) {
      fail(position, "'" + std::string(option) + "' is no width; write for example '<5' or '>5'");
    }
    if (result.ec != std::errc() || width > Step::kLargestWidth) {
      fail(position, "a width is at most " + std::to_string(Step::kLargestWidth));
    }
    step.isRightAligned = option.front() == '>';
    step.width = static_cast<std::uint8_t>(width);
  }

  static void parseTime(Step& step, std::string_view format, std::size_t position) {
    if (format.empty()) fail(position, "a time without a format; write for example {time:%H:%M:%S}");
    for (std::size_t i = 0; i < format.size(); ++i) {
      const std::size_t start = position + i;
      std::size_t digits = 0;
      char directive = '%';
      if (format[i] != '%') {
        step.text += format[i];
      } else {
        directive = i + 1 < format.size() ? format[i + 1] : ' ';
        const bool isFraction = directive == '3' || directive == '6' || directive == '9';
        if (isFraction && (i + 2 >= format.size() || format[i + 2] != 'f')) directive = ' ';
        digits = digitsOf(directive);
        if (digits == 0) {
          fail(start,
               "'" + std::string(format.substr(i, isFraction ? 3 : 2)) +
                   "' is no part of a time; there are %Y, %m, %d, %H, %M, %S, %3f, %6f, %9f, %z and %%");
        }
        i += isFraction ? 2 : 1;
        if (directive == '%') {
          step.text += '%';
        } else if (step.text.size() + digits <= Step::kLongestTime) {
          (isFraction ? step.fractions : step.parts)
              .push_back({static_cast<std::uint8_t>(step.text.size()), directive});
          step.text.append(digits, '0');
        } else {
          step.text.append(digits, '0');
        }
      }
      if (step.text.size() > Step::kLongestTime) {
        fail(start, "a time has at most " + std::to_string(Step::kLongestTime) + " characters");
      }
    }
  }

  // Returns how many characters a part of a time has, or 0 if there is no such part.
  static std::size_t digitsOf(char directive) {
    switch (directive) {
      case 'Y':
        return 4;
      case 'm':
      case 'd':
      case 'H':
      case 'M':
      case 'S':
        return 2;
      case '3':
      case '6':
      case '9':
        return static_cast<std::size_t>(directive - '0');
      case 'z':
        return 5;
      case '%':
        return 1;
      default:
        return 0;
    }
  }

  const std::string_view pattern_;
  std::size_t position_ = 0;
  std::size_t timeCount_ = 0;
  std::vector<Step> steps_;
};

}  // namespace

std::vector<LUMLogPatternStep> LUMLogPatternSteps(std::string_view pattern) {
  if (pattern.empty()) throw std::invalid_argument("column 1: the pattern is empty");
  return Parser(pattern).steps();
}
