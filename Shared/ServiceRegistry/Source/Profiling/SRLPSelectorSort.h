#pragma once

/// Sorts a list by 64-bit answers about pairs of its elements, even if the answers define no order.
///
///     const auto difference = [](int receiver, int argument) { return std::int64_t{receiver} - argument; };
///     std::vector<int> sorted = SRLPSelectorSort(std::vector{3, 1, 2}, difference);      // 1, 2, 3
///
/// Each answer is one element's, the receiver's, about another one, the argument. The receiver stands before
/// the argument in the list. An answer over 0 puts the receiver behind the argument. Any other answer keeps
/// their order.
///
/// If the answers define an order, the list is sorted by it, and equal elements keep their order. Otherwise
/// the result is some permutation of the list. This is so for an accessor, whose answer depends on the
/// receiver alone. The steps are always the same, and so is the result:
///
/// - The list is halved. The first half is the shorter one if the length is odd.
/// - Each half is sorted.
/// - The halves are merged. While both have elements left, the receiver is the first element of the first
///   half, and the argument that of the second. The argument comes next if the answer is over 0, otherwise
///   the receiver.
///
/// So the list is reversed if every answer is over 0, and unchanged if no answer is.
///
/// Asks for n elements at most n * ceil(log2(n)) times.
///
/// Not for: sorting by an order (std::stable_sort).

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

// Sorts `list`. `spare` has room for half of its elements.
template <class T, class Answer>
void sort(std::span<T> list, std::span<T> spare, Answer& answer) {
  if (list.size() < 2) return;
  const std::span<T> firstHalf = list.first(list.size() / 2);
  const std::span<T> secondHalf = list.subspan(firstHalf.size());
  sort(firstHalf, spare, answer);
  sort(secondHalf, spare, answer);

  // Moves the first half away, so that the merge never overwrites an unread element of the second.
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

/// Returns the elements of `list`, sorted. `answer` takes two of them: the receiver and the argument. Throws
/// what `answer` and moving an element throw, and std::bad_alloc.
template <std::default_initializable T, class Answer>
  requires std::same_as<std::invoke_result_t<Answer&, const T&, const T&>, std::int64_t>
std::vector<T> SRLPSelectorSort(std::vector<T> list, Answer answer) {
  std::vector<T> spare(list.size() / 2);
  SRLPSelectorSortDetail::sort(std::span<T>(list), std::span<T>(spare), answer);
  return list;
}
