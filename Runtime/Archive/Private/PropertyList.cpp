#include "Runtime/Archive/Private/PropertyList.h"

#include <algorithm>
#include <limits>
#include <numeric>

namespace rt {

namespace {

// Finds how deep each value is nested. It does not recurse, since deeply nested values would exhaust the
// stack.
class DepthCheck {
 public:
  explicit DepthCheck(const PropertyList& list) : list_(list), heights_(list.values.size(), kUnknown) {}

  const char* run() {
    for (PropertyList::Index index = 0; index < heights_.size(); ++index) {
      if (heights_[index] != kUnknown) continue;
      enter(index);
      while (!path_.empty()) {
        if (const char* error = step()) return error;
      }
    }
    return nullptr;
  }

 private:
  static constexpr std::uint32_t kUnknown = 0;
  static constexpr std::uint32_t kOnPath = std::numeric_limits<std::uint32_t>::max();

  struct Place {
    PropertyList::Index index;
    std::size_t next;
    std::uint32_t height;
  };

  void enter(PropertyList::Index index) {
    heights_[index] = kOnPath;
    path_.push_back({index, 0, 1});
  }

  const char* step() {
    Place& place = path_.back();
    const std::optional<PropertyList::Index> child = childOf(place.index, place.next);
    if (!child) {
      leave();
      return nullptr;
    }
    const std::uint32_t height = heights_[*child];
    if (height == kOnPath) return "a collection contains itself";
    if (height == kUnknown) {
      enter(*child);
    } else {
      ++place.next;
      place.height = std::max(place.height, height + 1);
    }
    return path_.size() + (height == kUnknown ? 0 : height) > PropertyList::kMaximumDepth
               ? "nested too deeply"
               : nullptr;
  }

  void leave() {
    heights_[path_.back().index] = path_.back().height;
    path_.pop_back();
  }

  // Keys are texts, so only values lead further down.
  std::optional<PropertyList::Index> childOf(PropertyList::Index parent, std::size_t position) const {
    if (const auto* array = list_.get<PropertyList::Array>(parent)) {
      return position < array->size() ? std::optional((*array)[position]) : std::nullopt;
    }
    if (const auto* dictionary = list_.get<PropertyList::Dictionary>(parent)) {
      return position < dictionary->size() ? std::optional((*dictionary)[position].second) : std::nullopt;
    }
    return std::nullopt;
  }

  const PropertyList& list_;
  // 1 for a value without elements.
  std::vector<std::uint32_t> heights_;
  std::vector<Place> path_;
};

}  // namespace

PropertyList::Index PropertyList::add(Value value) {
  values.push_back(std::move(value));
  return static_cast<Index>(values.size() - 1);
}

std::optional<PropertyList::Index> PropertyList::find(Index dictionary, std::string_view key) const noexcept {
  const auto* entries = get<Dictionary>(dictionary);
  if (entries == nullptr) return std::nullopt;
  for (const auto& [keyIndex, valueIndex] : *entries) {
    const Text* text = get<Text>(keyIndex);
    if (text != nullptr && *text == key) return valueIndex;
  }
  return std::nullopt;
}

const char* PropertyList::structuralError() const {
  const auto isOutside = [this](Index index) { return index >= values.size(); };
  if (isOutside(root)) return "the root is not in the table";
  for (const Value& value : values) {
    if (const auto* array = std::get_if<Array>(&value)) {
      if (std::ranges::any_of(*array, isOutside)) return "an array refers outside the table";
    } else if (const auto* dictionary = std::get_if<Dictionary>(&value)) {
      for (const auto& [key, element] : *dictionary) {
        if (isOutside(key) || isOutside(element)) return "a dictionary refers outside the table";
        if (get<Text>(key) == nullptr) return "a dictionary has a key that is no text";
      }
    }
  }
  if (hasRepeatedKey()) return "a dictionary has a key twice";
  return DepthCheck(*this).run();
}

bool PropertyList::hasRepeatedKey() const {
  // Equal texts get the same number, and keys are compared by number: many dictionaries may share long keys.
  std::vector<Index> texts;
  for (Index index = 0; index < values.size(); ++index) {
    if (get<Text>(index) != nullptr) texts.push_back(index);
  }
  std::ranges::sort(texts, {}, [this](Index index) { return std::string_view(*get<Text>(index)); });
  std::vector<Index> numbers(values.size());
  for (std::size_t i = 0; i < texts.size(); ++i) {
    const bool isSame = i > 0 && *get<Text>(texts[i]) == *get<Text>(texts[i - 1]);
    numbers[texts[i]] = isSame ? numbers[texts[i - 1]] : static_cast<Index>(i);
  }

  std::vector<Index> keys;
  return std::ranges::any_of(values, [&](const Value& value) {
    const auto* dictionary = std::get_if<Dictionary>(&value);
    if (dictionary == nullptr) return false;
    keys.clear();
    for (const auto& entry : *dictionary) keys.push_back(numbers[entry.first]);
    std::ranges::sort(keys);
    return std::ranges::adjacent_find(keys) != keys.end();
  });
}

}  // namespace rt
