#pragma once

// A list whose elements hold the pointer to the next one, so that it allocates nothing. For rt::Queue and
// its threads only.

#include <utility>

namespace rt::detail {

/// Elements in the order in which they were appended. An element is in one list at a time, and has a member
/// `Element* next_`. The list does not own its elements.
template <class Element>
class LinkedList {
 public:
  bool isEmpty() const noexcept { return first_ == nullptr; }

  void append(Element& element) noexcept {
    element.next_ = nullptr;
    (first_ == nullptr ? first_ : last_->next_) = &element;
    last_ = &element;
  }

  /// Puts all of `others` before the elements of this list.
  void prepend(LinkedList others) noexcept {
    if (others.isEmpty()) return;
    others.last_->next_ = first_;
    if (first_ == nullptr) last_ = others.last_;
    first_ = others.first_;
  }

  /// Takes the first element out of the list and returns it, or null if there is none.
  Element* takeFirst() noexcept {
    Element* element = first_;
    if (element != nullptr) first_ = element->next_;
    return element;
  }

  /// Takes all elements out of the list.
  LinkedList takeAll() noexcept { return std::exchange(*this, LinkedList()); }

  /// Takes `end`, which is in the list, and all elements before it out of the list. Returns those before it.
  LinkedList takeBefore(const Element& end) noexcept {
    LinkedList before;
    for (;;) {
      Element* first = takeFirst();
      if (first == &end) return before;
      before.append(*first);
    }
  }

 private:
  Element* first_ = nullptr;
  Element* last_ = nullptr;
};

}  // namespace rt::detail
