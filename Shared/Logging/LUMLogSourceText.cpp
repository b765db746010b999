// `LUMLog` gets files and functions as C strings, mostly the same few again. The table finds the string of
// each by its address. It compares the text each time, since a library may have been unloaded and another may
// have taken its place.

#include "Shared/Logging/LUMLogSourceText.h"

#include <array>
#include <atomic>
#include <cstdint>
#include <cstring>
#include <string_view>

namespace {

/// One text that is known. Once written it stays.
struct Slot {
  std::atomic<const char*> text{nullptr};
  std::atomic<rt::StringObject*> string{nullptr};
};

constexpr std::size_t kProbes = 8;

// Twice as many as are remembered, so that most texts are found at the first look.
constinit std::array<Slot, 2 * kLUMLogSourceTextCount> slots;
constinit std::atomic<std::size_t> count{0};

std::size_t firstSlotOf(const char* text) noexcept {
  // Texts of one file lie side by side, at any address.
  const std::uint64_t mixed = reinterpret_cast<std::uintptr_t>(text) * 0x9E3779B97F4A7C15U;
  return (mixed >> 40) % slots.size();
}

bool isStill(const char* text, std::string_view string) noexcept {
  return std::strncmp(text, string.data(), string.size()) == 0 && text[string.size()] == '\0';
}

/// The string of a known text, which has not changed; or the slot for one that is to be known, which is
/// nobody else's from now on; or neither.
struct Found {
  rt::StringObject* string = nullptr;
  Slot* slot = nullptr;
};

Found find(const char* text) noexcept {
  const std::size_t first = firstSlotOf(text);
  for (std::size_t i = 0; i < kProbes; ++i) {
    Slot& slot = slots[(first + i) % slots.size()];
    const char* known = slot.text.load(std::memory_order_relaxed);
    if (known == nullptr) {
      if (count.load(std::memory_order_relaxed) >= kLUMLogSourceTextCount) return {};
      if (slot.text.compare_exchange_strong(known, text, std::memory_order_relaxed)) {
        count.fetch_add(1, std::memory_order_relaxed);
        return {nullptr, &slot};
      }
    }
    if (known == text) {
      rt::StringObject* string = slot.string.load(std::memory_order_acquire);
      if (string != nullptr && !isStill(text, string->view())) string = nullptr;
      return {string, nullptr};
    }
  }
  // Other texts have all of its places, of which a half is free when the most are kept.
  return {};
}

}  // namespace

rt::String LUMLogSourceText(const char* text) {
  if (text == nullptr) return nullptr;
  const Found found = find(text);
  if (found.string != nullptr) {
    return rt::String::from(rt::Ref<rt::StringObject>(found.string));
  }
  rt::String string = rt::String::fromUTF8(text);
  if (found.slot != nullptr && string && string.length() <= kLUMLogSourceTextLength) {
    found.slot->string.store(rt::StringObject::immortalCopyOf(string), std::memory_order_release);
  }
  return string;
}
