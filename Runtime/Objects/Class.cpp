#include "Runtime/Objects/Class.h"

#include <array>
#include <atomic>
#include <cstdio>

#include "Runtime/Locks/UnfairLock.h"

namespace rt {

namespace {

// Finds records by name. It is ready before anything runs and is never destroyed. It consists of entries that
// the records bring along, so it allocates nothing. Looking up takes no lock.
template <class Info>
class NameTable {
 public:
  // `kind` is what a report calls the records.
  explicit constexpr NameTable(const char* kind) noexcept : kind_(kind) {}

  void add(detail::NamedEntry<Info>& entry) noexcept {
    const LockGuard guard(lock_);
    std::atomic<Entry*>* place = &buckets_[entry.nameHash % kBucketCount];
    for (Entry* known = nullptr; (known = place->load(std::memory_order_relaxed)) != nullptr;
         place = &known->next) {
      if (known->info == entry.info) return;
      if (known->info->name == entry.info->name) return reportClash(*known);
    }
    place->store(&entry, std::memory_order_release);
  }

  const Info* find(std::string_view name) const noexcept {
    const Entry* entry = buckets_[detail::nameHash(name) % kBucketCount].load(std::memory_order_acquire);
    while (entry != nullptr && entry->info->name != name) entry = entry->next.load(std::memory_order_acquire);
    return entry != nullptr ? entry->info : nullptr;
  }

 private:
  using Entry = detail::NamedEntry<Info>;

  void reportClash(Entry& first) const noexcept {
    if (first.isClashReported) return;
    first.isClashReported = true;
    std::fprintf(stderr, "rt: two %s are called \"%.*s\"; the first is kept\n", kind_,
                 static_cast<int>(first.info->name.size()), first.info->name.data());
  }

  static constexpr std::size_t kBucketCount = 256;

  const char* kind_;
  UnfairLock lock_;
  std::array<std::atomic<Entry*>, kBucketCount> buckets_{};
};

constinit NameTable<ClassInfo> classes("classes");
constinit NameTable<ProtocolInfo> protocols("protocols");

constinit detail::NamedEntry<ClassInfo> objectEntry{&classInfo<Object>(), detail::nameHash("Object")};

}  // namespace

// Object's record is not made by a template, so nothing else announces it.
template struct detail::AnnouncedOnLoading<objectEntry>;

namespace detail {

void announce(NamedEntry<ClassInfo>& entry) noexcept {
  classes.add(entry);
}
void announce(NamedEntry<ProtocolInfo>& entry) noexcept {
  protocols.add(entry);
}

}  // namespace detail

const ClassInfo* classNamed(std::string_view name) noexcept {
  return classes.find(name);
}
const ProtocolInfo* protocolNamed(std::string_view name) noexcept {
  return protocols.find(name);
}

}  // namespace rt
