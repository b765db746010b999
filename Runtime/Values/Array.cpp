#include "Runtime/Values/Array.h"

#include <algorithm>
#include <stdexcept>
#include <utility>

#include "Runtime/Values/Private/CollectionDescription.h"

namespace rt {

Array::Array(std::vector<Ref<Object>> elements) : elements_(std::move(elements)) {
  if (std::ranges::any_of(elements_, [](const Ref<Object>& element) { return element == nullptr; })) {
    throw std::invalid_argument("rt::Array: an element is null");
  }
}

bool Array::contains(const Object* object) const {
  return std::ranges::any_of(elements_, [&](const Ref<Object>& element) { return element->isEqual(object); });
}

bool Array::isEqual(const Object* other) const {
  if (this == other) return true;
  const auto* array = cast<Array>(other);
  return array != nullptr &&
         std::ranges::equal(elements_, array->elements_,
                            [](const auto& mine, const auto& its) { return mine->isEqual(its.get()); });
}

std::uint64_t Array::hash() const {
  std::uint64_t hash = count();
  for (const Ref<Object>& element : elements_) hash = hash * 41 + element->hash();
  return hash;
}

String Array::description() const {
  return detail::describeArray(elements_);
}

}  // namespace rt
