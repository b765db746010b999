#pragma once

/// A hash table with fast look-ups, which need no lock.
///
///     SRLTable<const void*, rt::Ref<rt::Object>> instances;
///     instances.insert(identifier, instance);                                   // with the lock
///     if (const auto* found = instances.find(identifier)) use(found->second);   // with it or without
///
/// It exists for two reasons. A thread may look for an instance without the lock while another one inserts
/// one, which `std::unordered_map` does not allow. And that map needs a division to find an entry. A look-up
/// in 1 to 1000 entries takes the map 2.1 to 4.0 ns, and this table 1.1 to 1.9 ns (g++ 12, on a busy virtual
/// machine; trust the order). `script/bench Registry` compares whole requests with a container of such maps.
///
/// A `std::unordered_map` owns the entries, and an index finds them. Its number of places is a power of two,
/// and at least half of them are free. When the index grows, the old one is kept, since threads may still be
/// reading it.
///
/// Threads: changing a table and iterating over it need a lock. Looking into it needs none, unless a thread
/// removes entries or assigns to a value that another thread may read.
///
/// Not for: tables with few look-ups.

// An index keeps the one that it has replaced. So instances of a scope, and APIs by identifier, are found
// without a lock, and a request takes one lock: the registry's. When scopes end, a scope's lock may be taken
// inside the registry's. Inside a scope's lock, only the lock of a creation that begins is taken. No other
// thread holds that one.
//
// Only the tables of scopes and of bindings lose entries. Look-ups in these hold the registry's lock.

#include <algorithm>
#include <atomic>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <new>
#include <type_traits>
#include <unordered_map>
#include <utility>
#include <vector>

template <class Key, class Value, class Hash = std::hash<Key>, class Equal = std::equal_to<Key>>
class SRLTable {
  static_assert(std::is_nothrow_invocable_v<const Hash&, const Key&>);

 public:
  using Entries = std::unordered_map<Key, Value, Hash, Equal>;
  using Entry = typename Entries::value_type;
  using Node = typename Entries::node_type;

  SRLTable() = default;
  SRLTable(const SRLTable& other) : entries_(other.entries_), index_(makeIndex(1).release()) {}
  SRLTable& operator=(const SRLTable&) = delete;
  ~SRLTable() { delete index(); }

  /// Returns the entry for `key`, whose address never changes. Null if there is none. Neither locks nor
  /// allocates. Throws what comparing keys throws.
  const Entry* find(const Key& key) const {
    const Index* index = index_.load(std::memory_order_acquire);
    return index != nullptr ? index->find(key) : nullptr;
  }
  Entry* find(const Key& key) { return const_cast<Entry*>(std::as_const(*this).find(key)); }

  /// Returns the entry for `key`. Adds one with `value` if there is none. Throws std::bad_alloc and what
  /// comparing keys throws. Nothing has changed then.
  template <class Given>
  Entry& insert(const Key& key, Given&& value) {
    makeRoom(1);
    const auto [entry, isNew] = entries_.try_emplace(key, std::forward<Given>(value));
    if (isNew) index()->insert(*entry);
    return *entry;
  }

  /// Returns an entry for `key` that is not in the table yet. The caller sets its value and inserts it later.
  /// Makes room for `count` more entries, so that inserting as many prepared ones cannot fail. Throws
  /// std::bad_alloc. Nothing has changed then.
  Node prepare(const Key& key, std::size_t count) {
    makeRoom(count);
    return entries_.extract(entries_.try_emplace(key).first);
  }

  /// Inserts an entry that `prepare` returned. The table has none for its key yet. Does not allocate.
  Entry& insert(Node&& prepared) noexcept {
    Entry& entry = *entries_.insert(std::move(prepared)).position;
    index()->insert(entry);
    return entry;
  }

  /// Does the same as `insert`, but nothing if there is no memory. For entries that are only caches.
  template <class Given>
  void tryInsert(const Key& key, Given&& value) {
    try {
      insert(key, std::forward<Given>(value));
    } catch (const std::bad_alloc&) {  // NOLINT(bugprone-empty-catch): then there is no entry
    }
  }

  /// Returns the value for `key`. Adds an entry with a default value if there is none. Throws like `insert`.
  Value& operator[](const Key& key) {
    Entry* found = find(key);
    return (found != nullptr ? *found : insert(key, Value())).second;
  }

  /// Removes the entry for `key`, if there is one. No other thread may look into the table meanwhile.
  void erase(const Key& key) {
    if (entries_.erase(key) == 0) return;
    index()->clear();
    for (const Entry& entry : entries_) index()->insert(entry);
  }

  /// Removes entries of the table and returns them. No other thread may look into the table meanwhile. Throws
  /// std::bad_alloc. Nothing has changed then.
  std::vector<Node> extract(const std::vector<typename Entries::const_iterator>& entries) {
    std::vector<Node> nodes;
    if (entries.empty()) return nodes;
    nodes.reserve(entries.size());
    auto rest = std::make_unique<Index>(entries_.size());
    for (const auto& entry : entries) nodes.push_back(entries_.extract(entry));
    for (const Entry& entry : entries_) rest->insert(entry);
    delete index_.exchange(rest.release(), std::memory_order_relaxed);
    return nodes;
  }

  /// Returns the entries, for iterating.
  const Entries& entries() const noexcept { return entries_; }

 private:
  class Index {
   public:
    // Makes an empty index with room for twice as many entries as `count`.
    explicit Index(std::size_t count)
        : lastPlace_(std::bit_ceil(std::max(4 * count, kPlacesOfSmallest)) - 1),
          shift_(std::countl_zero(std::uint64_t{lastPlace_})),
          places_(std::make_unique<std::atomic<const Entry*>[]>(lastPlace_ + 1)) {}

    bool hasRoomFor(std::size_t count) const noexcept { return 2 * (count_ + count) <= lastPlace_ + 1; }

    const Entry* find(const Key& key) const {
      for (std::size_t at = start(key);; at = next(at)) {
        const Entry* entry = places_[at].load(std::memory_order_acquire);
        if (entry == nullptr || Equal()(entry->first, key)) return entry;
      }
    }

    // Precondition: there is room, and no entry with the same key.
    void insert(const Entry& entry) noexcept {
      std::size_t at = start(entry.first);
      while (places_[at].load(std::memory_order_relaxed) != nullptr) at = next(at);
      places_[at].store(&entry, std::memory_order_release);
      ++count_;
    }

    void clear() noexcept {
      for (std::size_t at = 0; at <= lastPlace_; ++at) places_[at].store(nullptr, std::memory_order_relaxed);
      count_ = 0;
    }

    // Owns `replaced` from now on.
    void keep(const Index* replaced) noexcept { replaced_.reset(replaced); }

   private:
    static constexpr std::size_t kPlacesOfSmallest = 8;

    // Takes the upper bits of a product, which depend on all bits of the hash. An address's hash ends in
    // zeros.
    std::size_t start(const Key& key) const noexcept { return Hash()(key) * 0x9E3779B97F4A7C15U >> shift_; }
    std::size_t next(std::size_t at) const noexcept { return (at + 1) & lastPlace_; }

    const std::size_t lastPlace_;
    const int shift_;
    // Not a vector, which checks each access against its size where assertions are on.
    const std::unique_ptr<std::atomic<const Entry*>[]> places_;
    std::size_t count_ = 0;
    std::unique_ptr<const Index> replaced_;
  };

  void makeRoom(std::size_t count) {
    constexpr std::size_t kSmallest = 8;
    const std::size_t needed = entries_.size() + count;
    if (needed >= entries_.bucket_count()) entries_.reserve(std::max(2 * needed, kSmallest));
    if (index() != nullptr && index()->hasRoomFor(count)) return;
    std::unique_ptr<Index> larger = makeIndex(count);
    larger->keep(index());
    index_.store(larger.release(), std::memory_order_release);
  }

  // Returns an index of all entries, with room for `count` more.
  std::unique_ptr<Index> makeIndex(std::size_t count) const {
    auto made = std::make_unique<Index>(entries_.size() + count);
    for (const Entry& entry : entries_) made->insert(entry);
    return made;
  }

  Index* index() const noexcept { return index_.load(std::memory_order_relaxed); }

  Entries entries_;
  // Owned.
  std::atomic<Index*> index_ = nullptr;
};
