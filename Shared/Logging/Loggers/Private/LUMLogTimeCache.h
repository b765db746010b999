#pragma once

// The text of one second, which most lines share. Internal to LUMLogPattern.
//
// The text is a record under a sequence number, which is odd while a thread changes the record. Nobody waits
// for that thread: the others make the text themselves meanwhile, and so does a signal handler. (If a fork
// happens at that moment, the child makes the text each time.)

#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <cstring>

/// Threads: any thread may use a cache, also in a signal handler.
class LUMLogTimeCache {
 public:
  static constexpr std::size_t kCapacity = 96;
  using Text = std::array<char, kCapacity>;

  /// Copies the first `length` characters of the text of `second` to `text`. Returns false if the cache does
  /// not have it. More of `text` may be changed.
  bool read(std::int64_t second, std::size_t length, Text& text) const noexcept {
    const std::uint32_t sequence = sequence_.load(std::memory_order_acquire);
    if (sequence % 2 != 0 || second_.load(std::memory_order_relaxed) != second) return false;
    for (std::size_t i = 0; i < length; i += sizeof(Word)) {
      const Word word = words_[i / sizeof(Word)].load(std::memory_order_relaxed);
      std::memcpy(text.data() + i, &word, sizeof(Word));
    }
    std::atomic_thread_fence(std::memory_order_acquire);
    return sequence_.load(std::memory_order_relaxed) == sequence;
  }

  /// Keeps the text of `second`, unless another thread is just keeping one.
  void write(std::int64_t second, std::size_t length, const Text& text) noexcept {
    std::uint32_t sequence = sequence_.load(std::memory_order_relaxed);
    if (sequence % 2 != 0 ||
        !sequence_.compare_exchange_strong(sequence, sequence + 1, std::memory_order_relaxed)) {
      return;
    }
    std::atomic_thread_fence(std::memory_order_release);
    second_.store(second, std::memory_order_relaxed);
    for (std::size_t i = 0; i < length; i += sizeof(Word)) {
      Word word = 0;
      std::memcpy(&word, text.data() + i, sizeof(Word));
      words_[i / sizeof(Word)].store(word, std::memory_order_relaxed);
    }
    sequence_.store(sequence + 2, std::memory_order_release);
  }

 private:
  using Word = std::uint64_t;

  std::atomic<std::uint32_t> sequence_ = 0;
  // No message has this time.
  std::atomic<std::int64_t> second_ = INT64_MIN;
  std::array<std::atomic<Word>, kCapacity / sizeof(Word)> words_{};
};
