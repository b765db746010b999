#pragma once

// A bounded queue of messages for many threads, without a lock. Internal to LUMBoundedLogger.
//
// Each message has a position, counted from 0 for the life of the queue. The place of a position holds a
// turn, which says for which round it is empty or full. So a thread that has got a position owns its place
// until it changes the turn. No thread ever waits in here, which is why a signal handler may take messages.

#include <atomic>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <memory>

#include "Shared/Logging/LUMLogMessage.h"

class LUMLogMessageQueue {
 public:
  /// What a thread is taking. A signal handler on that thread reads it.
  struct Claim {
    /// One more than the position that the thread takes, and 0 if it takes none.
    std::atomic<std::uint64_t> next = 0;
    /// The message that it has taken and not written yet.
    std::atomic<LUMLogMessage*> message = nullptr;
  };

  struct Taken {
    /// The reference of the queue goes to the caller.
    LUMLogMessage* message = nullptr;
    std::uint64_t position = 0;
    /// What `push` was given.
    std::uint64_t droppedBefore = 0;
  };

  /// Makes a queue with room for `capacity` messages, a power of two. Throws std::bad_alloc.
  explicit LUMLogMessageQueue(std::size_t capacity)
      : places_(std::make_unique<Place[]>(capacity)),
        mask_(capacity - 1),
        shift_(static_cast<unsigned>(std::countr_zero(capacity))) {}

  std::size_t capacity() const noexcept { return mask_ + 1; }

  /// Return the position of the oldest message, and that of the next one to be pushed.
  std::uint64_t head() const noexcept { return head_.load(std::memory_order_seq_cst); }
  std::uint64_t tail() const noexcept { return tail_.load(std::memory_order_seq_cst); }

  /// Appends `message`, whose reference the queue takes over. Returns its position, or kFull. Sequentially
  /// consistent: a later read of another atomic variable is not done before `tail` has grown.
  std::uint64_t push(LUMLogMessage& message, std::uint64_t droppedBefore) noexcept {
    std::uint64_t position = tail_.load(std::memory_order_relaxed);
    for (;;) {
      Place& place = places_[position & mask_];
      const std::uint64_t empty = emptyTurn(position);
      const std::uint64_t turn = place.turn.load(std::memory_order_acquire);
      if (turn == empty) {
        if (!tail_.compare_exchange_weak(position, position + 1, std::memory_order_seq_cst,
                                         std::memory_order_relaxed))
          continue;
        place.message.store(&message, std::memory_order_relaxed);
        place.droppedBefore = droppedBefore;
        place.turn.store(empty + 1, std::memory_order_release);
        return position;
      }
      const std::uint64_t known = position;
      position = tail_.load(std::memory_order_relaxed);
      if (turn < empty && position == known) return kFull;
    }
  }
  static constexpr std::uint64_t kFull = ~std::uint64_t{0};

  /// Takes the oldest message. Returns false if there is none, or if its thread has not finished `push`.
  /// Notes in `claim`, if it is not null, what it takes.
  bool take(Taken& taken, Claim* claim = nullptr) noexcept {
    std::uint64_t position = head_.load(std::memory_order_relaxed);
    for (;;) {
      Place& place = places_[position & mask_];
      const std::uint64_t full = emptyTurn(position) + 1;
      const std::uint64_t turn = place.turn.load(std::memory_order_acquire);
      if (turn < full) return false;
      if (turn > full) {
        position = head_.load(std::memory_order_relaxed);
        continue;
      }
      if (claim != nullptr) claim->next.store(position + 1, std::memory_order_relaxed);
      if (!head_.compare_exchange_weak(position, position + 1, std::memory_order_seq_cst,
                                       std::memory_order_relaxed))
        continue;
      taken = {place.message.load(std::memory_order_relaxed), position, place.droppedBefore};
      if (claim != nullptr) claim->message.store(taken.message, std::memory_order_release);
      place.turn.store(full + 1, std::memory_order_release);
      return true;
    }
  }

  /// Returns the message that the interrupted thread of `claim` was about to take out of its place, or null.
  /// For a signal handler on that thread, if no other thread takes messages.
  LUMLogMessage* messageOf(const Claim& claim) const noexcept {
    const std::uint64_t next = claim.next.load(std::memory_order_relaxed);
    if (next == 0 || head() < next) return nullptr;
    const Place& place = places_[(next - 1) & mask_];
    return place.turn.load(std::memory_order_acquire) == emptyTurn(next - 1) + 1
               ? place.message.load(std::memory_order_relaxed)
               : nullptr;
  }

  /// Gives up the oldest position, whose thread does not finish `push`. For a signal handler.
  void skip() noexcept {
    std::uint64_t position = head();
    head_.compare_exchange_strong(position, position + 1);
  }

  /// Forgets all messages, without releasing them. For the child of a fork, where nobody else uses the queue.
  /// Positions go on, so that those that a caller knows stay behind.
  void forget() noexcept {
    const std::uint64_t next = ((tail() >> shift_) + 1) << shift_;
    for (std::size_t i = 0; i <= mask_; ++i) {
      places_[i].turn.store(emptyTurn(next), std::memory_order_relaxed);
      places_[i].message.store(nullptr, std::memory_order_relaxed);
    }
    head_.store(next);
    tail_.store(next);
  }

 private:
  struct Place {
    // Twice the round for which the place is empty, plus 1 while it is full.
    std::atomic<std::uint64_t> turn = 0;
    std::atomic<LUMLogMessage*> message = nullptr;
    std::uint64_t droppedBefore = 0;
  };

  std::uint64_t emptyTurn(std::uint64_t position) const noexcept { return 2 * (position >> shift_); }

  const std::unique_ptr<Place[]> places_;
  const std::size_t mask_;
  const unsigned shift_;
  // On cache lines of their own: the threads that log write one, and the thread that takes writes the other.
  alignas(64) std::atomic<std::uint64_t> tail_ = 0;
  alignas(64) std::atomic<std::uint64_t> head_ = 0;
};
