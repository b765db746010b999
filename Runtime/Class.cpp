#include "Runtime/Class.h"

#include <array>
#include <cstdint>
#include <cstdio>
#include <mutex>

namespace rt {

namespace {

/// Records by name. Constant-initialised and never destroyed, so that it may be used before `main` and
/// after it; holds the entries that the records bring along, so that nothing is allocated.
template <class Record>
class Names {
 public:
  explicit constexpr Names(const char* kind) : kind_(kind) {}

  void add(detail::Named<Record>& entry) noexcept {
    const std::scoped_lock lock(mutex_);
    detail::Named<Record>** place = &bucket(entry.record->name);
    for (; *place != nullptr; place = &(*place)->next) {
      detail::Named<Record>& known = **place;
      if (known.record == entry.record) return;
      if (known.record->name != entry.record->name) continue;
      if (!known.isReported) {
        known.isReported = true;
        std::fprintf(stderr, "rt: two %s are named \"%.*s\"; the first is kept\n", kind_,
                     static_cast<int>(entry.record->name.size()), entry.record->name.data());
      }
      return;
    }
    *place = &entry;
  }

  const Record* find(std::string_view name) noexcept {
    const std::scoped_lock lock(mutex_);
    for (detail::Named<Record>* each = bucket(name); each != nullptr; each = each->next) {
      if (each->record->name == name) return each->record;
    }
    return nullptr;
  }

 private:
  detail::Named<Record>*& bucket(std::string_view name) noexcept {
    std::uint32_t hash = 2166136261U;
    for (const char character : name) hash = (hash ^ static_cast<unsigned char>(character)) * 16777619U;
    return buckets_[hash % buckets_.size()];
  }

  const char* kind_;
  std::mutex mutex_;
  std::array<detail::Named<Record>*, 256> buckets_{};
};

constinit Names<ClassInfo> classes("classes");
constinit Names<ProtocolInfo> protocols("protocols");

[[gnu::constructor(101)]] void announceObject() {
  static constinit detail::Named<ClassInfo> entry{&classInfo<Object>()};
  classes.add(entry);
}

}  // namespace

namespace detail {

void announce(Named<ClassInfo>& entry) noexcept {
  classes.add(entry);
}
void announce(Named<ProtocolInfo>& entry) noexcept {
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
