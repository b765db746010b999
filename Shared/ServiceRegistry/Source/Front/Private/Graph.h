#pragma once

// Finds mistakes in a module's wiring while compiling. It works on plain data. So a module of a thousand
// services costs the compiler a few loops instead of a million types.

#include <array>
#include <cstddef>
#include <cstdint>
#include <string_view>

#include "Shared/ServiceRegistry/Source/Front/Dependency.h"
#include "Shared/ServiceRegistry/Source/Front/Service.h"

namespace srl::detail {

// One implementation of a service, and what its constructor takes.
struct Maker {
  std::size_t service = 0;
  const Need* needs = nullptr;
  std::size_t needCount = 0;
  // True if the object asks for what it needs when it is used.
  bool isDeferred = false;
};

enum class MistakeKind : unsigned char {
  kNone,
  kBoundTwice,
  kOneName,
  kDimensionTwice,
  kNothingBound,
  kOneOfMany,
  kManyOfOne,
  kNoSuchDimension,
  kNarrowerScope,
  kCycle,
};

// The first mistake in a module. `services` are indices: for a cycle those of its services, else that of the
// service and of the one that it needs.
template <std::size_t capacity>
struct Mistake {
  MistakeKind kind = MistakeKind::kNone;
  std::size_t service = 0;
  std::size_t maker = 0;
  std::size_t need = 0;
  std::array<std::size_t, capacity> path{};
  std::size_t pathLength = 0;
};

// Orders identifiers as a module's bindings are ordered: shorter ones first, equally long ones by their
// bytes.
constexpr bool isBefore(std::string_view first, std::string_view second) noexcept {
  if (first.size() != second.size()) return first.size() < second.size();
  // A built-in function compares in one step of the compiler.
  return __builtin_memcmp(first.data(), second.data(), first.size()) < 0;
}

template <std::size_t serviceCount, std::size_t makerCount>
struct Graph {
  static constexpr std::size_t kNone = serviceCount;

  std::array<ServiceData, serviceCount> services{};
  std::array<bool, serviceCount> isExpected{};
  // The index of the declaration that each service comes from.
  std::array<std::size_t, serviceCount> declarations{};
  std::array<Maker, makerCount> makers{};
  // The indices of the services, sorted by their names.
  std::array<std::size_t, serviceCount> sorted{};

  // Merges sorted runs of doubling length.
  constexpr void sort() {
    std::array<std::size_t, serviceCount> merged{};
    for (std::size_t index = 0; index < serviceCount; ++index) sorted[index] = index;
    for (std::size_t run = 1; run < serviceCount; run *= 2) {
      for (std::size_t begin = 0; begin < serviceCount; begin += 2 * run) {
        const std::size_t middle = begin + run < serviceCount ? begin + run : serviceCount;
        const std::size_t end = begin + 2 * run < serviceCount ? begin + 2 * run : serviceCount;
        std::size_t left = begin;
        std::size_t right = middle;
        for (std::size_t next = begin; next < end; ++next) {
          const bool takesRight = right < end && (left == middle || isBefore(services[sorted[right]].name,
                                                                             services[sorted[left]].name));
          merged[next] = sorted[takesRight ? right++ : left++];
        }
      }
      sorted = merged;
    }
  }

  // Returns the index of a service. kNone if the module neither binds nor expects it.
  constexpr std::size_t find(std::string_view name, const char* identity) const noexcept {
    std::size_t begin = 0;
    std::size_t end = serviceCount;
    while (begin < end) {
      const std::size_t middle = (begin + end) / 2;
      if (isBefore(services[sorted[middle]].name, name)) {
        begin = middle + 1;
      } else {
        end = middle;
      }
    }
    return begin < serviceCount && services[sorted[begin]].identity == identity ? sorted[begin] : kNone;
  }

  using Found = Mistake<serviceCount + 1>;

  constexpr Found mistake() const {
    Found found = mistakeOfServices();
    for (std::size_t maker = 0; maker < makerCount && found.kind == MistakeKind::kNone; ++maker) {
      for (std::size_t need = 0; need < makers[maker].needCount && found.kind == MistakeKind::kNone; ++need) {
        found.kind = mistakeOfNeed(makers[maker], makers[maker].needs[need]);
        found.service = makers[maker].service;
        found.maker = maker;
        found.need = need;
      }
    }
    return found.kind != MistakeKind::kNone ? found : cycle();
  }

 private:
  constexpr Found mistakeOfServices() const {
    for (std::size_t index = 0; index < serviceCount; ++index) {
      if (services[index].scope.isRepeated) return {.kind = MistakeKind::kDimensionTwice, .service = index};
    }
    for (std::size_t index = 1; index < serviceCount; ++index) {
      const std::size_t first = sorted[index - 1];
      const std::size_t second = sorted[index];
      if (services[first].name != services[second].name) continue;
      const bool isOne = services[first].identity == services[second].identity;
      return {
          .kind = isOne ? MistakeKind::kBoundTwice : MistakeKind::kOneName, .service = first, .need = second};
    }
    return {};
  }

  constexpr MistakeKind mistakeOfNeed(const Maker& maker, const Need& need) const {
    const Dimensions& scope = services[maker.service].scope;
    if (need.kind == NeedKind::kGiven) return MistakeKind::kNone;
    if (need.kind == NeedKind::kTag) {
      return scope.indexOf(need.identity) == scope.count ? MistakeKind::kNoSuchDimension : MistakeKind::kNone;
    }
    const std::size_t index = find(need.name, need.identity);
    if (index == kNone)
      return need.kind == NeedKind::kMaybe ? MistakeKind::kNone : MistakeKind::kNothingBound;
    const ServiceData& service = services[index];
    if (service.isMany && need.kind != NeedKind::kAll) return MistakeKind::kOneOfMany;
    if (!service.isMany && need.kind == NeedKind::kAll) return MistakeKind::kManyOfOne;
    return scope.hasAllOf(service.scope) ? MistakeKind::kNone : MistakeKind::kNarrowerScope;
  }

  // Searches depth-first, with a stack of its own, since compilers limit how deep functions nest.
  constexpr Found cycle() const {
    struct Frame {
      std::size_t service;
      std::size_t maker;
      std::size_t need;
    };
    // The first maker of each service. The makers of one service follow each other.
    std::array<std::size_t, serviceCount + 1> first{};
    for (std::size_t service = 0; service <= serviceCount; ++service) first[service] = makerCount;
    for (std::size_t maker = makerCount; maker-- > 0;) first[makers[maker].service] = maker;
    enum State : unsigned char { kNew, kOpen, kDone };
    std::array<State, serviceCount + 1> states{};
    std::array<Frame, serviceCount + 1> stack{};
    for (std::size_t start = 0; start < serviceCount; ++start) {
      if (states[start] != kNew) continue;
      std::size_t depth = 0;
      stack[depth++] = {start, first[start], 0};
      states[start] = kOpen;
      while (depth > 0) {
        Frame& top = stack[depth - 1];
        if (top.maker == makerCount || makers[top.maker].service != top.service) {
          states[top.service] = kDone;
          --depth;
          continue;
        }
        const Maker& maker = makers[top.maker];
        if (maker.isDeferred || top.need == maker.needCount) {
          ++top.maker;
          top.need = 0;
          continue;
        }
        const Need& need = maker.needs[top.need++];
        if (need.kind != NeedKind::kOne && need.kind != NeedKind::kMaybe && need.kind != NeedKind::kAll)
          continue;
        const std::size_t next = find(need.name, need.identity);
        if (next == kNone || states[next] == kDone) continue;
        if (states[next] == kOpen) {
          Found found{.kind = MistakeKind::kCycle, .service = next};
          std::size_t index = 0;
          while (stack[index].service != next) ++index;
          for (; index < depth; ++index) found.path[found.pathLength++] = stack[index].service;
          found.path[found.pathLength++] = next;
          return found;
        }
        states[next] = kOpen;
        stack[depth++] = {next, first[next], 0};
      }
    }
    return {};
  }
};

}  // namespace srl::detail
