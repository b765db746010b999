// The sort. It is right for answers that define an order, and harmless for all others.

#include "Shared/ServiceRegistry/Source/Profiling/Private/SRLPSelectorSort.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <memory>
#include <numeric>
#include <random>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

namespace {

using testing::ElementsAre;
using testing::IsEmpty;

constexpr std::int64_t kLeast = std::numeric_limits<std::int64_t>::min();
constexpr std::int64_t kGreatest = std::numeric_limits<std::int64_t>::max();

std::int64_t difference(int receiver, int argument) {
  return std::int64_t{receiver} - argument;
}

// Returns 0, 1, 2 and so on.
std::vector<int> numbers(std::size_t count) {
  std::vector<int> numbers(count);
  std::iota(numbers.begin(), numbers.end(), 0);
  return numbers;
}

TEST(SRLPSelectorSort, AsksNothingForLessThanTwoElements) {
  const auto fail = [](int, int) -> std::int64_t { throw std::logic_error("was asked"); };
  EXPECT_THAT(SRLPSelectorSort(std::vector<int>(), fail), IsEmpty());
  EXPECT_THAT(SRLPSelectorSort(std::vector{7}, fail), ElementsAre(7));
}

TEST(SRLPSelectorSort, MovesTheReceiverBehindTheArgumentForAnAnswerOverZero) {
  const auto sortedBy = [](std::int64_t answer) {
    return SRLPSelectorSort(std::vector{1, 2}, [=](int, int) { return answer; });
  };
  EXPECT_THAT(sortedBy(1), ElementsAre(2, 1));
  EXPECT_THAT(sortedBy(kGreatest), ElementsAre(2, 1));
  EXPECT_THAT(sortedBy(std::int64_t{1} << 32), ElementsAre(2, 1));  // 0 in 32 bits
  EXPECT_THAT(sortedBy(0), ElementsAre(1, 2));
  EXPECT_THAT(sortedBy(-1), ElementsAre(1, 2));
  EXPECT_THAT(sortedBy(kLeast), ElementsAre(1, 2));
}

TEST(SRLPSelectorSort, AsksTheEarlierElementAboutTheLaterOne) {
  std::vector<std::pair<int, int>> questions;
  SRLPSelectorSort(std::vector{1, 2, 3}, [&](int receiver, int argument) -> std::int64_t {
    questions.emplace_back(receiver, argument);
    return 1;
  });
  // The second half becomes 3, 2. The first half is 1, which is then compared with both.
  EXPECT_THAT(questions, ElementsAre(std::pair(2, 3), std::pair(1, 3), std::pair(1, 2)));
}

TEST(SRLPSelectorSort, ReversesTheListIfAllAnswersAreOverZeroAndKeepsItIfNoneIs) {
  for (std::size_t count = 0; count < 100; ++count) {
    const std::vector<int> list = numbers(count);
    std::vector<int> reversed = list;
    std::ranges::reverse(reversed);
    EXPECT_EQ(SRLPSelectorSort(list, [](int, int) { return kGreatest; }), reversed);
    EXPECT_EQ(SRLPSelectorSort(list, [](int, int) { return std::int64_t{0}; }), list);
    EXPECT_EQ(SRLPSelectorSort(list, [](int, int) { return kLeast; }), list);
  }
}

TEST(SRLPSelectorSort, IsAStableSortForAnOrder) {
  using Pair = std::pair<int, int>;
  std::mt19937 random(1);  // the same every time
  for (std::size_t count = 0; count < 200; ++count) {
    std::vector<Pair> list;
    for (std::size_t i = 0; i < count; ++i)
      list.emplace_back(std::uniform_int_distribution(-9, 9)(random), static_cast<int>(i));
    // The second number is the place in the list. So the model keeps the order of equal elements.
    std::vector<Pair> model = list;
    std::ranges::sort(model);
    EXPECT_EQ(SRLPSelectorSort(list,
                               [](const Pair& receiver, const Pair& argument) {
                                 return difference(receiver.first, argument.first);
                               }),
              model);
  }
}

TEST(SRLPSelectorSort, AsksAtMostAsOftenAsPromised) {
  for (std::size_t count = 1; count < 300; ++count) {
    std::size_t questions = 0;
    SRLPSelectorSort(numbers(count), [&](int receiver, int argument) {
      ++questions;
      return difference(receiver % 7, argument % 7);
    });
    std::size_t logarithm = 0;
    while ((std::size_t{1} << logarithm) < count) ++logarithm;
    EXPECT_LE(questions, count * logarithm);
  }
}

TEST(SRLPSelectorSort, KeepsEveryElementForRandomAnswers) {
  std::mt19937_64 random(2);  // the same every time
  for (int round = 0; round < 2000; ++round) {
    // The strings are on the heap, so that the sanitizers notice every access outside of the list.
    std::vector<std::string> list;
    for (std::size_t i = random() % 70; i > 0; --i)
      list.push_back("a string of many letters: " + std::to_string(i));
    std::vector<std::string> sorted = SRLPSelectorSort(
        list, [&](const std::string&, const std::string&) { return static_cast<std::int64_t>(random()); });
    std::ranges::sort(sorted);
    std::ranges::sort(list);
    EXPECT_EQ(sorted, list);
  }
}

TEST(SRLPSelectorSort, SortsElementsThatCannotBeCopied) {
  std::vector<std::unique_ptr<int>> list;
  for (const int number : {2, 3, 1}) list.push_back(std::make_unique<int>(number));
  list = SRLPSelectorSort(std::move(list),
                          [](const std::unique_ptr<int>& receiver, const std::unique_ptr<int>& argument) {
                            return difference(*receiver, *argument);
                          });
  EXPECT_EQ(*list[0], 1);
  EXPECT_EQ(*list[1], 2);
  EXPECT_EQ(*list[2], 3);
}

TEST(SRLPSelectorSort, ThrowsWhatAnAnswerThrows) {
  int questions = 0;
  EXPECT_THROW(SRLPSelectorSort(numbers(50),
                                [&](int, int) -> std::int64_t {
                                  if (++questions == 40) throw std::runtime_error("no answer");
                                  return 1;
                                }),
               std::runtime_error);
  EXPECT_EQ(questions, 40);
}

}  // namespace
