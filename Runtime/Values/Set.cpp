#include "Runtime/Values/Set.h"

#include <algorithm>
#include <stdexcept>
#include <vector>

#include "Runtime/Values/CollectionDescription.h"

namespace rt {

bool Set::Builder::add(const Ref<Object>& object) {
  if (object == nullptr) throw std::invalid_argument("rt::Set: an element is null");
  return elements_.insert(object).second;
}

bool Set::Builder::remove(const Object* object) {
  if (object == nullptr) return false;
  const auto element = elements_.find(object);
  if (element == elements_.end()) return false;
  elements_.erase(element);
  return true;
}

Object* Set::member(const Object* object) const {
  if (object == nullptr) return nullptr;
  const auto element = elements_.find(object);
  return element != elements_.end() ? element->get() : nullptr;
}

bool Set::isEqual(const Object* other) const {
  if (this == other) return true;
  const auto* set = cast<Set>(other);
  return set != nullptr && set->count() == count() &&
         std::ranges::all_of(elements_,
                             [set](const Ref<Object>& element) { return set->contains(element.get()); });
}

std::uint64_t Set::hash() const {
  // A sum does not depend on the order of the elements, which differs between equal sets.
  std::uint64_t hash = count();
  for (const Ref<Object>& element : elements_) hash += element->hash();
  return hash;
}

String Set::description() const {
  std::vector<detail::DescribedEntry> elements;
  elements.reserve(count());
  for (const Ref<Object>& element : elements_) elements.push_back({element.get()});
  return detail::describeSet(elements);
}

}  // namespace rt
