// Reads files of user defaults. An unchanged file must keep its text. A changed file must be readable again.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>

#include "Runtime/Base/UTF8.h"
#include "Runtime/Defaults/DefaultsText.h"

namespace {

void require(bool condition) {
  if (!condition) std::abort();
}

bool has(const rt::DefaultsText& text, std::string_view key, std::string_view value) {
  const std::string* found = text.find(key);
  return found != nullptr && *found == value;
}

}  // namespace

// The first byte gives the lengths of a key and of a value, which follow it. The rest of the input is a file.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string input(reinterpret_cast<const char*>(data), size);
  std::string_view rest = input;
  const auto take = [&rest](std::size_t length) {
    const std::string_view taken = rest.substr(0, std::min(length, rest.size()));
    rest.remove_prefix(taken.size());
    return taken;
  };
  const unsigned lengths = size > 0 ? data[0] : 0U;
  take(1);
  const std::string_view key = take(lengths & 0xFU);
  const std::string_view value = take(lengths >> 4U);

  try {
    rt::DefaultsText text = rt::DefaultsText::parsed(rest);
    const std::string content = text.text();
    require(content == std::string(rest) || content == std::string(rest) + "\n");
    if (!rt::isValidUTF8(key) || !rt::isValidUTF8(value)) return 0;

    text.set(key, value);
    rt::DefaultsText again = rt::DefaultsText::parsed(text.text());
    require(has(text, key, value) && has(again, key, value));
    require(again.text() == text.text());
    again.remove(key);
    require(again.find(key) == nullptr);
    require(rt::DefaultsText::parsed(again.text()).find(key) == nullptr);
  } catch (const rt::MalformedDefaults&) {
    return 0;
  }
  return 0;
}
