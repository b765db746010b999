#pragma once

/// A list in the order that answers of 64 bits give, whatever they are.
///
///     const auto difference = [](int receiver, int argument) { return std::int64_t{receiver} - argument; };
///     std::vector<int> sorted = SRLPSelectorSort(std::vector{3, 1, 2}, difference);      // 1, 2, 3
///
/// An element is asked about another that stands behind it: over 0 puts it after that one, 0 leaves both as
/// they stand, and less than 0 as well. Answers that make an order sort the list by it, and equal elements
/// keep theirs. Answers that make none, such as an accessor's, which tells of one of the two only, give some
/// order of the same elements all the same, and always the same one: the list is halved, the first half being
/// the shorter one if they differ; each half is sorted; and as long as both have elements left, the first
/// of the first half is asked about the first of the second, which goes before it if the answer is over 0.
/// So the list comes out reversed if every answer is over 0, and as it was if none is.
///
/// Asks for n elements at most n times the binary logarithm of n, rounded up.
///
/// Not for: orders, for which there is std::stable_sort.

// The comparison of measured events answers with a start time, which is not an order. With such a comparison
// `std::sort` has undefined behaviour. This merge sort is defined for every answer.

#include <algorithm>
#include <concepts>
#include <cstddef>
#include <cstdint>
#include <span>
#include <type_traits>
#include <utility>
#include <vector>

namespace SRLPSelectorSortDetail {

/// Sorts `list`; `spare` has room for half of it.
template <class T, class Answer>
void sort(std::span<T> list, std::span<T> spare, Answer& answer) {
  if (list.size() < 2) return;
  const std::span<T> firstHalf = list.first(list.size() / 2);
  const std::span<T> secondHalf = list.subspan(firstHalf.size());
  sort(firstHalf, spare, answer);
  sort(secondHalf, spare, answer);

  // With the first half out of the way, what is written never overtakes the second.
  auto first = spare.begin();
  const auto firstEnd = std::ranges::move(firstHalf, first).out;
  auto second = secondHalf.begin();
  auto out = list.begin();
  while (first != firstEnd && second != secondHalf.end()) {
    auto& next = answer(std::as_const(*first), std::as_const(*second)) > 0 ? second : first;
    *out++ = std::move(*next++);
  }
  std::move(first, firstEnd, out);
}

}  // namespace SRLPSelectorSortDetail

/// The elements of `list`, sorted. `answer` takes two of them, the receiver and the argument. Throws what it
/// throws, what moving an element throws, and std::bad_alloc.
template <std::default_initializable T, class Answer>
  requires std::same_as<std::invoke_result_t<Answer&, const T&, const T&>, std::int64_t>
std::vector<T> SRLPSelectorSort(std::vector<T> list, Answer answer) {
  std::vector<T> spare(list.size() / 2);
  SRLPSelectorSortDetail::sort(std::span<T>(list), std::span<T>(spare), answer);
  return list;
}
