#include "Runtime/Values/Dictionary.h"

#include <algorithm>
#include <stdexcept>
#include <vector>

#include "Runtime/Values/CollectionDescription.h"

namespace rt {

void Dictionary::Builder::set(const Ref<Object>& key, const Ref<Object>& value) {
  if (key == nullptr) throw std::invalid_argument("rt::Dictionary: a key is null");
  if (value != nullptr) {
    entries_.insert_or_assign(key, value);
  } else {
    remove(key.get());
  }
}

void Dictionary::Builder::remove(const Object* key) {
  if (key == nullptr) return;
  if (const auto entry = entries_.find(key); entry != entries_.end()) entries_.erase(entry);
}

Ref<Dictionary> Dictionary::of(std::initializer_list<std::pair<Ref<Object>, Ref<Object>>> entries) {
  Builder builder;
  for (const auto& [key, value] : entries) builder.set(key, value);
  return std::move(builder).dictionary();
}

Object* Dictionary::objectForKey(const Object* key) const {
  if (key == nullptr) return nullptr;
  const auto entry = entries_.find(key);
  return entry != entries_.end() ? entry->second.get() : nullptr;
}

bool Dictionary::isEqual(const Object* other) const {
  if (this == other) return true;
  const auto* dictionary = cast<Dictionary>(other);
  return dictionary != nullptr && dictionary->count() == count() &&
         std::ranges::all_of(entries_, [dictionary](const auto& entry) {
           return entry.second->isEqual(dictionary->objectForKey(entry.first.get()));
         });
}

std::uint64_t Dictionary::hash() const {
  // A sum does not depend on the order of the entries, which differs between equal dictionaries.
  std::uint64_t hash = count();
  for (const auto& [key, value] : entries_) hash += key->hash() * 41 + value->hash();
  return hash;
}

String Dictionary::description() const {
  std::vector<detail::DescribedEntry> entries;
  entries.reserve(count());
  for (const auto& [key, value] : entries_) entries.push_back({key.get(), value.get()});
  return detail::describeDictionary(entries);
}

}  // namespace rt
