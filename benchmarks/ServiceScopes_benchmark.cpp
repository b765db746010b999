// Compares tag sets with the simplest code for the same, and a scope's look-up with its necessary steps.

#include <benchmark/benchmark.h>

#include <array>
#include <cstddef>
#include <cstdint>
#include <unordered_map>
#include <vector>

#include "Comparison.h"
#include "Runtime/Base/ThreadSafety.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Objects/Block.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Values/Array.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTag.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSet.h"
#include "Shared/ServiceRegistry/Source/Private/SRLMemoizingScope.h"

namespace {

const SecondThread secondThread;

using rt::Ref;

class Tag final : public rt::Implements<Tag, rt::Object, SRLScopeTag> {
 public:
  explicit Tag(std::uint64_t number) : number_(number) {}
  bool isEqual(const rt::Object* other) const override {
    const auto* tag = rt::cast<Tag>(other);
    return tag != nullptr && tag->number_ == number_;
  }
  std::uint64_t hash() const override { return number_; }

 private:
  const std::uint64_t number_;
};

Ref<rt::Array> fourTags() {
  return rt::Array::of(rt::make<Tag>(1U), rt::make<Tag>(2U), rt::make<Tag>(3U), rt::make<Tag>(4U));
}

void hashTags(benchmark::State& state) {
  const Ref<rt::Array> tags = fourTags();
  SRLScopeTagSet set = SRLScopeTagSetCreateWithTags(tags.get());
  for (auto _ : state) {
    benchmark::DoNotOptimize(set);
    benchmark::DoNotOptimize(SRLScopeTagSetHash(set));
  }
}
void hashTagsOfVector(benchmark::State& state) {
  const Ref<rt::Array> tags = fourTags();
  std::vector<rt::Object*> set;
  for (const Ref<rt::Object>& tag : *tags) set.push_back(tag.get());
  for (auto _ : state) {
    benchmark::DoNotOptimize(set);
    std::uint64_t hash = 0x7FFFFFFF;
    for (const rt::Object* tag : set) hash = hash * 41 + tag->hash();
    benchmark::DoNotOptimize(hash);
  }
}

// The tags are equal but not identical.
void compareTags(benchmark::State& state) {
  const Ref<rt::Array> tags = fourTags();
  const Ref<rt::Array> others = fourTags();
  SRLScopeTagSet first = SRLScopeTagSetCreateWithTags(tags.get());
  SRLScopeTagSet second = SRLScopeTagSetCreateWithTags(others.get());
  for (auto _ : state) {
    benchmark::DoNotOptimize(first);
    benchmark::DoNotOptimize(second);
    benchmark::DoNotOptimize(SRLScopeTagSetEqual(first, second));
  }
}
void compareArraysOfTags(benchmark::State& state) {
  Ref<rt::Array> first = fourTags();
  Ref<rt::Array> second = fourTags();
  for (auto _ : state) {
    benchmark::DoNotOptimize(first);
    benchmark::DoNotOptimize(second);
    benchmark::DoNotOptimize(first->isEqual(second.get()));
  }
}

// Masks bit by bit, and counts bits for the index of each tag.
[[gnu::noinline]] SRLScopeTagSet maskedByCounting(const SRLScopeTagSet& set, SRLScopeType apiScope,
                                                  SRLScopeType implScope) {
  SRLScopeTagSet masked;
  std::size_t tags = 0;
  while (tags < SRLScopeTagSet::kCapacity && set.tags[tags] != nullptr) ++tags;
  if (tags != static_cast<std::size_t>(__builtin_popcount(apiScope))) return masked;
  if (implScope == apiScope) return set;
  if ((implScope & ~apiScope) != 0) return masked;
  std::size_t next = 0;
  for (SRLScopeType bit = 1; bit != 0; bit <<= 1U) {
    if ((implScope & bit) == 0) continue;
    const auto index = static_cast<std::size_t>(__builtin_popcount(apiScope & (bit - 1)));
    masked.tags[next++] = SRLScopeTagSetCFRefTypeForIndex(set, index);
  }
  return masked;
}

template <SRLScopeTagSet (*mask)(const SRLScopeTagSet&, SRLScopeType, SRLScopeType), SRLScopeType kept>
void maskTags(benchmark::State& state) {
  const Ref<rt::Array> tags = fourTags();
  SRLScopeTagSet set = SRLScopeTagSetCreateWithTags(tags.get());
  SRLScopeType apiScope = 0b1010101;
  SRLScopeType implScope = kept;
  for (auto _ : state) {
    benchmark::DoNotOptimize(set);
    benchmark::DoNotOptimize(apiScope);
    benchmark::DoNotOptimize(implScope);
    SRLScopeTagSet masked = mask(set, apiScope, implScope);
    benchmark::DoNotOptimize(masked);
  }
}

class Instance final : public rt::Implements<Instance, rt::Object> {};

constexpr std::size_t kInstances = 100;
using Identifiers = std::array<char, kInstances>;

// Returns the index of the next instance. The order visits each instance, and differs from the table's order.
std::size_t next(std::size_t index) {
  return (index + 37) % kInstances;
}

void findInstance(benchmark::State& state) {
  const Identifiers identifiers{};
  const Ref<SRLMemoizingScope> scope = SRLMemoizingScope::init();
  const rt::Block<Ref<rt::Object>()> factory = []() -> Ref<rt::Object> { return rt::make<Instance>(); };
  for (const char& identifier : identifiers) scope->instanceForIdentifier(&identifier, nullptr, factory);
  std::size_t i = 0;
  for (auto _ : state) {
    bool isCreated = false;
    benchmark::DoNotOptimize(scope->instanceForIdentifier(&identifiers[i], &isCreated, factory));
    i = next(i);
  }
}

// The necessary steps of the look-up: it takes and releases a lock, searches a table, and retains and
// releases an object.
struct Bare {
  rt::UnfairLock lock;
  std::unordered_map<const void*, Ref<rt::Object>> instances RT_GUARDED_BY(lock);
};
void findInstanceBare(benchmark::State& state) {
  const Identifiers identifiers{};
  Bare bare;
  {
    const rt::LockGuard guard(bare.lock);
    for (const char& identifier : identifiers) bare.instances.emplace(&identifier, rt::make<Instance>());
  }
  std::size_t i = 0;
  for (auto _ : state) {
    Ref<rt::Object> instance;
    {
      const rt::LockGuard guard(bare.lock);
      const auto found = bare.instances.find(&identifiers[i]);
      if (found != bare.instances.end()) instance = found->second;
    }
    benchmark::DoNotOptimize(instance);
    i = next(i);
  }
}

BENCHMARK(hashTags)->Name("TagSet/hash/ours");
BENCHMARK(hashTagsOfVector)->Name("TagSet/hash/vector");
BENCHMARK(compareTags)->Name("TagSet/equal/ours");
BENCHMARK(compareArraysOfTags)->Name("TagSet/equal/array");
BENCHMARK((maskTags<SRLScopeTagSetMaskingWithScopes, 0b1000100>))->Name("TagSet/mask-two-of-four/ours");
BENCHMARK((maskTags<maskedByCounting, 0b1000100>))->Name("TagSet/mask-two-of-four/counting");
BENCHMARK((maskTags<SRLScopeTagSetMaskingWithScopes, 0b1010101>))->Name("TagSet/mask-four/ours");
BENCHMARK((maskTags<maskedByCounting, 0b1010101>))->Name("TagSet/mask-four/counting");
BENCHMARK(findInstance)->Name("Scope/hit/ours");
BENCHMARK(findInstanceBare)->Name("Scope/hit/bare");

const Bound maskTwo{"TagSet/mask-two-of-four", "counting", 0.5};
const Bound maskFour{"TagSet/mask-four", "counting", 1.0};
const Bound hit{"Scope/hit", "bare", 1.2};

}  // namespace
