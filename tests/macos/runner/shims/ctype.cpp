// Inline functions of <ctype.h> read a table with the properties of characters. It is that of the "C" locale,
// which is the only one that programs use here.

#include <array>
#include <cctype>
#include <cstdint>

#include "tests/macos/runner/Shims.h"

namespace {

constexpr int kCharacters = 256;
constexpr int kAscii = 128;

// The part of _RuneLocale that is read.
struct Characters {
  std::array<char, 8> magic;
  std::array<char, 32> encoding;
  std::array<void*, 2> functions;
  std::int32_t invalid;
  std::array<std::uint32_t, kCharacters> properties;
  std::array<std::int32_t, kCharacters> lower;
  std::array<std::int32_t, kCharacters> upper;
  std::array<char, 256> more;
};

std::uint32_t propertiesOf(int character) {
  std::uint32_t result = 0;
  const auto add = [&](int has, std::uint32_t bit) {
    if (has != 0) result |= bit;
  };
  add(std::isalpha(character), 0x100);
  add(std::iscntrl(character), 0x200);
  add(std::isdigit(character), 0x400);
  add(std::isgraph(character), 0x800);
  add(std::islower(character), 0x1000);
  add(std::ispunct(character), 0x2000);
  add(std::isspace(character), 0x4000);
  add(std::isupper(character), 0x8000);
  add(std::isxdigit(character), 0x10000);
  add(std::isblank(character), 0x20000);
  add(std::isprint(character), 0x40000);
  if (std::isdigit(character) != 0) result |= static_cast<std::uint32_t>(character - '0');
  return result;
}

Characters& characters() {
  static Characters table = [] {
    Characters made{};
    for (int character = 0; character < kCharacters; ++character) {
      const auto at = static_cast<std::size_t>(character);
      const bool isAscii = character < kAscii;
      made.properties[at] = isAscii ? propertiesOf(character) : 0;
      made.lower[at] = isAscii ? std::tolower(character) : character;
      made.upper[at] = isAscii ? std::toupper(character) : character;
    }
    return made;
  }();
  return table;
}

int maskedProperties(int character, unsigned long mask) {
  if (character < 0 || character >= kCharacters) return 0;
  return static_cast<int>(characters().properties[static_cast<std::size_t>(character)] & mask);
}

int maskedPropertiesIn(int character, unsigned long mask, const void*) {
  return maskedProperties(character, mask);
}

int lower(int character) {
  return character >= 0 && character < kAscii ? std::tolower(character) : character;
}

int upper(int character) {
  return character >= 0 && character < kAscii ? std::toupper(character) : character;
}

int lowerIn(int character, const void*) {
  return lower(character);
}

int upperIn(int character, const void*) {
  return upper(character);
}

}  // namespace

shims::Table shims::ctype() {
  static const Shim table[] = {
      shim("_DefaultRuneLocale", &characters()),
      shim("__maskrune", &maskedProperties),
      shim("__maskrune_l", &maskedPropertiesIn),
      shim("___maskrune", &maskedProperties),
      shim("__tolower", &lower),
      shim("__toupper", &upper),
      shim("___tolower_l", &lowerIn),
      shim("___toupper_l", &upperIn),
      shim("tolower", &lower),
      shim("toupper", &upper),
  };
  return table;
}
