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

// A remembered text and its string. Each is written once.
struct Slot {
  std::atomic<const char*> text{nullptr};
  std::atomic<rt::StringObject*> string{nullptr};
};

constexpr std::size_t kProbes = 8;

// Twice as many slots as remembered texts, so that most texts are found at the first probe.
constinit std::array<Slot, 2 * kLUMLogSourceTextCount> slots;
constinit std::atomic<std::size_t> count{0};

std::size_t firstSlotOf(const char* text) noexcept {
  // The texts of one file are neighbours in memory, so the bits of the address are mixed.
  const std::uint64_t mixed = reinterpret_cast<std::uintptr_t>(text) * 0x9E3779B97F4A7C15U;
  return (mixed >> 40) % slots.size();
}

bool isStill(const char* text, std::string_view string) noexcept {
  return std::strncmp(text, string.data(), string.size()) == 0 && text[string.size()] == '\0';
}

// The result of a look-up. A known text that has not changed has its string. A new text may get a free slot,
// which the caller then owns.
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
  // Other texts occupy all the probed slots. That is rare, because at least half of all slots stay free.
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
