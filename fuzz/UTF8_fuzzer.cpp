// Compares the UTF-8 functions with a model that has no ranges, only the sets of all encoded characters and
// of all their beginnings.
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <string>
#include <string_view>
#include <unordered_set>

#include "Runtime/Base/UTF8.h"
#include "Runtime/Objects/String.h"

namespace {

void require(bool condition) {
  if (!condition) std::abort();
}

// Encodes `character` by the definition, with division instead of masks and shifts.
std::string encode(std::uint32_t character) {
  const auto byte = [](std::uint32_t value) { return static_cast<char>(static_cast<unsigned char>(value)); };
  if (character < 128) return {byte(character)};
  if (character < 2048) return {byte(192 + character / 64), byte(128 + character % 64)};
  if (character < 65536) {
    return {byte(224 + character / 4096), byte(128 + character / 64 % 64), byte(128 + character % 64)};
  }
  return {byte(240 + character / 262144), byte(128 + character / 4096 % 64), byte(128 + character / 64 % 64),
          byte(128 + character % 64)};
}

struct Model {
  std::unordered_set<std::string> characters;
  std::unordered_set<std::string> beginnings;

  Model() {
    for (std::uint32_t character = 0; character < 0x110000; ++character) {
      if (character >= 0xD800 && character < 0xE000) continue;
      std::string text = encode(character);
      for (std::size_t length = 1; length < text.size(); ++length) beginnings.insert(text.substr(0, length));
      characters.insert(std::move(text));
    }
  }

  // Returns the length of the character at the start of `bytes`, or 0.
  std::size_t character(std::string_view bytes) const {
    for (std::size_t length = 1; length <= 4 && length <= bytes.size(); ++length) {
      if (characters.contains(std::string(bytes.substr(0, length)))) return length;
    }
    return 0;
  }

  std::string repaired(std::string_view bytes) const {
    std::string result;
    while (!bytes.empty()) {
      std::size_t length = character(bytes);
      if (length != 0) {
        result += bytes.substr(0, length);
      } else {
        result += "\uFFFD";
        length = 1;
        while (length < bytes.size() && beginnings.contains(std::string(bytes.substr(0, length + 1))))
          ++length;
      }
      bytes.remove_prefix(length);
    }
    return result;
  }

  std::size_t validLength(std::string_view bytes) const {
    std::size_t valid = 0;
    while (const std::size_t length = character(bytes.substr(valid))) valid += length;
    return valid;
  }
};

const Model& model() {
  static const Model model;
  return model;
}

}  // namespace

// Builds the model before the first input, since that takes seconds.
extern "C" int LLVMFuzzerInitialize(int*, char***) {
  model();
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  // A copy of exactly this size, so that the sanitizer notices reads past the end.
  const std::string copy(reinterpret_cast<const char*>(data), size);
  const std::string_view bytes = copy;

  const std::size_t valid = model().validLength(bytes);
  require(rt::validUTF8Length(bytes) == valid);
  require(rt::isValidUTF8(bytes) == (valid == size));

  const rt::String checked = rt::String::fromUTF8(bytes);
  require(checked.isNull() == (valid != size));
  require(checked.isNull() || checked == bytes);

  const std::string expected = model().repaired(bytes);
  require(rt::String::fromUTF8Repaired(bytes) == expected);

  if (size >= 4) {
    std::uint32_t character = 0;
    std::memcpy(&character, data, sizeof character);
    character %= 0x120000;
    std::array<char, rt::kMaximumUTF8Length> encoded{};
    const std::size_t length = rt::encodeUTF8(character, encoded.data());
    const bool isCharacter = character < 0x110000 && (character < 0xD800 || character >= 0xE000);
    require(std::string_view(encoded.data(), length) == encode(isCharacter ? character : 0xFFFD));
  }
  return 0;
}
