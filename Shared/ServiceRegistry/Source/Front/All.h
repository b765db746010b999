#pragma once

/// The instances of a service that many implementations are bound to, as a range.
///
///     const srl::All<Importer> importers = srl::all<Importer>();
///     for (Importer& importer : importers) importer.run();
///
/// As a parameter of a constructor in a module's wiring, it asks for all of them when the object is made.
///
/// Ownership: it retains the instances. To keep one, make an rt::Ref from its address.
/// Threads: immutable; any thread may use it.
/// Not for: a service that only one implementation is bound to.

#include <cstddef>
#include <iterator>
#include <utility>

#include "Runtime/Base/Private/LifetimeBound.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Values/Array.h"

namespace srl {

template <class Interface>
class All {
 public:
  class Iterator {
   public:
    using iterator_category = std::input_iterator_tag;
    using iterator_concept = std::forward_iterator_tag;
    using value_type = Interface;
    using difference_type = std::ptrdiff_t;
    using reference = Interface&;
    using pointer = Interface*;

    Iterator() = default;
    explicit Iterator(rt::Array::Iterator position) : position_(position) {}

    // The registry binds only classes that conform to the interface, so that the cast succeeds.
    Interface& operator*() const { return *rt::cast<Interface>(position_->get()); }
    Interface* operator->() const { return &**this; }
    Iterator& operator++() {
      ++position_;
      return *this;
    }
    Iterator operator++(int) { return Iterator(position_++); }
    bool operator==(const Iterator&) const = default;

   private:
    rt::Array::Iterator position_;
  };

  /// Holds the elements of an array, each of which conforms to the interface. Null counts as empty.
  explicit All(rt::Ref<rt::Array> instances)
      : instances_(instances ? std::move(instances) : rt::make<rt::Array>()) {}

  // A copy has the same instances, and so has what was moved from.
  All(const All&) noexcept = default;
  All& operator=(const All&) noexcept = default;
  ~All() = default;

  Iterator begin() const noexcept RT_LIFETIME_BOUND { return Iterator(instances_->begin()); }
  Iterator end() const noexcept RT_LIFETIME_BOUND { return Iterator(instances_->end()); }
  std::size_t size() const noexcept { return instances_->count(); }
  bool empty() const noexcept { return instances_->isEmpty(); }

 private:
  rt::Ref<rt::Array> instances_;
};

}  // namespace srl
