#include "Runtime/Defaults/Private/DefaultsText.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <utility>

#include "Runtime/Base/Private/UTF8.h"

namespace rt {

namespace {

constexpr std::string_view kBlanks = " \t";
// The character behind a backslash, and the character that both stand for.
constexpr std::array<std::pair<char, char>, 5> kEscapes{
    {{'"', '"'}, {'\\', '\\'}, {'n', '\n'}, {'r', '\r'}, {'t', '\t'}}};

bool isControl(char character) {
  const auto byte = static_cast<unsigned char>(character);
  return byte < 0x20 || byte == 0x7F;
}

// Reads one line from its start to its end.
class Line {
 public:
  explicit Line(std::string_view text) : rest_(text) { skipBlanks(); }

  bool isSetting() const { return !rest_.empty() && rest_.front() != '#'; }

  std::string key() {
    if (rest_.front() == '=') fail("no key");
    std::string key = rest_.front() == '"' ? quoted() : bare("=#");
    if (rest_.empty() || rest_.front() != '=') fail("a key without a = behind it");
    rest_.remove_prefix(1);
    skipBlanks();
    return key;
  }

  std::string value() {
    if (rest_.empty() || rest_.front() != '"') return bare("#");
    std::string value = quoted();
    if (isSetting()) fail("text behind a quoted value");
    return value;
  }

 private:
  [[noreturn]] static void fail(const char* what) { throw MalformedDefaults(what); }

  void skipBlanks() { rest_.remove_prefix(std::min(rest_.find_first_not_of(kBlanks), rest_.size())); }

  // Takes the text before one of the characters `ends`. Returns it without blanks at its end.
  std::string bare(const char* ends) {
    const std::string_view all = rest_.substr(0, rest_.find_first_of(ends));
    rest_.remove_prefix(all.size());
    const std::string_view text = all.substr(0, all.find_last_not_of(kBlanks) + 1);
    if (std::ranges::any_of(text, [](char c) { return isControl(c) && c != '\t'; })) {
      fail("a control character");
    }
    return std::string(text);
  }

  std::string quoted() {
    std::string text;
    rest_.remove_prefix(1);
    for (;;) {
      if (rest_.empty()) fail("a quotation mark without its other");
      const char character = rest_.front();
      rest_.remove_prefix(1);
      if (character == '"') break;
      if (isControl(character) && character != '\t') fail("a control character");
      if (character == '\\') {
        appendEscaped(text);
      } else {
        text.push_back(character);
      }
    }
    skipBlanks();
    return text;
  }

  void appendEscaped(std::string& text) {
    const char character = rest_.empty() ? '\0' : rest_.front();
    const auto* escape = std::ranges::find(kEscapes, character, &std::pair<char, char>::first);
    if (escape != kEscapes.end()) {
      text.push_back(escape->second);
      rest_.remove_prefix(1);
      return;
    }
    unsigned point = 0;
    const std::string_view digits = rest_.substr(std::min<std::size_t>(1, rest_.size()), 4);
    const auto [end, error] = std::from_chars(digits.begin(), digits.end(), point, 16);
    if (character != 'u' || digits.size() != 4 || error != std::errc() || end != digits.end() ||
        (point >= 0xD800 && point < 0xE000)) {
      fail("a backslash that stands for no character");
    }
    char bytes[kMaximumUTF8Length];
    text.append(bytes, encodeUTF8(point, bytes));
    rest_.remove_prefix(5);
  }

  std::string_view rest_;
};

}  // namespace

DefaultsText DefaultsText::parsed(std::string_view text) {
  if (text.size() > kMaximumSize) throw MalformedDefaults("more than 1 MiB");
  DefaultsText result;
  std::size_t number = 0;
  for (std::size_t start = 0; start < text.size();) {
    const std::size_t end = std::min(text.find('\n', start), text.size());
    std::string_view content = text.substr(start, end - start);
    start = end + 1;
    ++number;
    try {
      if (!isValidUTF8(content)) throw MalformedDefaults("bytes that are not UTF-8");
      if (content.ends_with('\r')) content.remove_suffix(1);
      Line reader(content);
      if (!reader.isSetting()) continue;
      std::string key = reader.key();
      std::string value = reader.value();
      if (!result.settings_.try_emplace(std::move(key), std::move(value)).second) {
        throw MalformedDefaults("a key for the second time");
      }
    } catch (const MalformedDefaults& error) {
      throw MalformedDefaults("line " + std::to_string(number) + ": " + error.what());
    }
  }
  return result;
}

const std::string* DefaultsText::find(std::string_view key) const noexcept {
  const auto setting = settings_.find(key);
  return setting != settings_.end() ? &setting->second : nullptr;
}

}  // namespace rt
