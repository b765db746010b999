// What the compiler finds out about a module's wiring, here at run time on random wiring, and compared with
// plainer algorithms.

#include "Shared/ServiceRegistry/Source/Front/Private/Graph.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <deque>
#include <random>
#include <string>
#include <string_view>
#include <vector>

#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLBindingsModuleData.h"
#include "Shared/ServiceRegistry/Source/Front/Dependency.h"

namespace {

using srl::detail::Graph;
using srl::detail::MistakeKind;
using srl::detail::Need;
using srl::detail::NeedKind;

// Wiring in which each service has two makers, as many of the services of Many have.
template <std::size_t serviceCount>
struct RandomWiring {
  explicit RandomWiring(std::uint32_t seed, std::size_t needCount) : random(seed) {
    for (std::size_t index = 0; index < serviceCount; ++index) {
      names[index] =
          std::string(1 + random() % 3, static_cast<char>('a' + random() % 26)) + std::to_string(index);
      graph.services[index].name = names[index];
      graph.services[index].identity = &identities[index];
    }
    for (std::size_t maker = 0; maker < 2 * serviceCount; ++maker) {
      std::vector<Need>& all = needs.emplace_back();
      for (std::size_t count = random() % (needCount + 1); count > 0; --count) {
        const std::size_t needed = random() % serviceCount;
        const bool isLazy = random() % 3 == 0;
        all.push_back({isLazy ? NeedKind::kLazy : NeedKind::kOne, names[needed], &identities[needed]});
      }
      graph.makers[maker] = {maker / 2, all.data(), all.size(), random() % 8 == 0};
    }
    graph.sort();
  }

  // Returns whether making the first service needs the second one at once.
  bool isNeeded(std::size_t first, std::size_t second) const {
    for (std::size_t maker = 2 * first; maker < 2 * first + 2; ++maker) {
      if (graph.makers[maker].isDeferred) continue;
      for (const Need& need : needs[maker]) {
        if (need.kind == NeedKind::kOne && need.identity == &identities[second]) return true;
      }
    }
    return false;
  }

  // Removes services that need none of the rest, until none is left or all of the rest need others.
  bool hasCycle() const {
    std::vector<std::size_t> rest;
    for (std::size_t index = 0; index < serviceCount; ++index) rest.push_back(index);
    while (true) {
      const auto isFree = [&](std::size_t service) {
        return std::ranges::none_of(rest, [&](std::size_t other) { return isNeeded(service, other); });
      };
      if (std::erase_if(rest, isFree) == 0) return !rest.empty();
    }
  }

  std::mt19937 random;
  std::array<std::string, serviceCount> names;
  std::array<char, serviceCount> identities{};
  std::deque<std::vector<Need>> needs;
  Graph<serviceCount, 2 * serviceCount> graph;
};

TEST(Graph, FindsACycleIfThereIsOne) {
  int cycles = 0;
  for (std::uint32_t seed = 0; seed < 3000; ++seed) {
    const RandomWiring<9> wiring(seed, 1 + seed % 2);
    const auto found = wiring.graph.mistake();
    ASSERT_EQ(found.kind, wiring.hasCycle() ? MistakeKind::kCycle : MistakeKind::kNone) << seed;
    if (found.kind == MistakeKind::kNone) continue;
    ++cycles;
    ASSERT_GE(found.pathLength, 2U);
    EXPECT_EQ(found.path[0], found.path[found.pathLength - 1]);
    for (std::size_t step = 1; step < found.pathLength; ++step) {
      EXPECT_TRUE(wiring.isNeeded(found.path[step - 1], found.path[step])) << seed;
    }
  }
  EXPECT_GT(cycles, 500);
  EXPECT_LT(cycles, 2500);
}

TEST(Graph, SortsServicesAsBindingsAreSorted) {
  for (std::uint32_t seed = 0; seed < 50; ++seed) {
    const RandomWiring<37> wiring(seed, 0);
    for (std::size_t index = 1; index < 37; ++index) {
      EXPECT_TRUE(SRLIsIdentifierBefore(wiring.names[wiring.graph.sorted[index - 1]],
                                        wiring.names[wiring.graph.sorted[index]]));
    }
    for (std::size_t index = 0; index < 37; ++index) {
      EXPECT_EQ(wiring.graph.find(wiring.names[index], &wiring.identities[index]), index);
    }
    const char other = 0;
    EXPECT_EQ(wiring.graph.find(wiring.names[0], &other), wiring.graph.kNone);
    EXPECT_EQ(wiring.graph.find("", &other), wiring.graph.kNone);
    EXPECT_EQ(wiring.graph.find("zzzzzz", &other), wiring.graph.kNone);
  }
}

}  // namespace
