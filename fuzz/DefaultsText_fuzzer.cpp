// Files of user defaults: a text is read or refused, and a setting behind one that can be read is found.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>

#include "Runtime/Base/Private/UTF8.h"
#include "Runtime/Defaults/Private/DefaultsText.h"

namespace {

void require(bool condition) {
  if (!condition) std::abort();
}

}  // namespace

// The first byte says how long a key at the start is; the rest is a file. Where that can be read, a line with
// the key is put behind it: it is found, unless the file had the key.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string input(reinterpret_cast<const char*>(data), size);
  std::string_view rest = input;
  const std::size_t length = size > 0 ? data[0] & 0xFU : 0U;
  rest.remove_prefix(size > 0 ? 1 : 0);
  std::string key(rest.substr(0, length));
  rest.remove_prefix(key.size());

  bool isThere = false;
  try {
    const rt::DefaultsText text = rt::DefaultsText::parsed(rest);
    const std::string* const found = text.find(key);
    require(found == nullptr || rt::isValidUTF8(*found));
    isThere = found != nullptr;
  } catch (const rt::MalformedDefaults&) {
    return 0;
  }

  std::string written = "\"";
  for (const char character : key) {
    if (character == '"' || character == '\\') written += '\\';
    written += character;
  }
  written += "\" = value";
  try {
    const rt::DefaultsText again = rt::DefaultsText::parsed(std::string(rest) + "\n" + written);
    const std::string* const found = again.find(key);
    require(!isThere && found != nullptr && *found == "value");
  } catch (const rt::MalformedDefaults&) {
    bool isPlain = rt::isValidUTF8(key);
    for (const char character : key) {
      const auto byte = static_cast<unsigned char>(character);
      if ((byte < 0x20 && byte != '\t') || byte == 0x7F) isPlain = false;
    }
    require(isThere || !isPlain || input.size() >= rt::DefaultsText::kMaximumSize - 64);
  }
  return 0;
}
