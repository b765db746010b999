#include "Runtime/Archive/KeyedArchiver.h"

#include <algorithm>
#include <cstdint>
#include <functional>
#include <limits>
#include <map>
#include <string>
#include <unordered_map>
#include <utility>

#include "Runtime/Archive/Private/KeyedArchiveFormat.h"
#include "Runtime/Archive/Private/PropertyList.h"
#include "Runtime/Objects/Exception.h"
#include "Runtime/Values/Array.h"
#include "Runtime/Values/Dictionary.h"
#include "Runtime/Values/Number.h"

namespace rt {

namespace {

using namespace detail::keyedArchive;

PropertyList::Value valueOf(const Number& number) {
  switch (number.kind()) {
    case Number::Kind::kBoolean:
      return number.booleanValue();
    case Number::Kind::kSigned:
      return number.integerValue();
    case Number::Kind::kUnsigned:
      return number.unsignedValue();
    case Number::Kind::kReal:
      break;
  }
  return number.realValue();
}

// Orders the keys of dictionaries, so that equal dictionaries become equal bytes. Numbers come before texts.
bool isBefore(const Ref<Object>& first, const Ref<Object>& second) {
  const auto* firstNumber = cast<Number>(first.get());
  const auto* secondNumber = cast<Number>(second.get());
  if (firstNumber != nullptr && secondNumber != nullptr) return firstNumber->compare(*secondNumber) < 0;
  if (firstNumber != nullptr || secondNumber != nullptr) return firstNumber != nullptr;
  return String::from(first.get()) < String::from(second.get());
}

// Returns the sum, or the largest number if it is larger. Objects that refer to each other may have any
// size.
std::size_t sum(std::size_t first, std::size_t second) noexcept {
  return second > std::numeric_limits<std::size_t>::max() - first ? std::numeric_limits<std::size_t>::max()
                                                                  : first + second;
}

[[noreturn]] void fail(const std::string& reason) {
  throw Exception("KeyedArchiverException"_s, String::fromUTF8Repaired(reason));
}

}  // namespace

class KeyedArchiver::Encoder {
 public:
  // The functions of KeyedArchiver. `archiver` is the one that objects' `encodeWithCoder` gets.
  explicit Encoder(KeyedArchiver& archiver);
  void encodeObject(const Ref<Object>& object, std::string_view key);
  std::vector<std::byte> encodedData();

 private:
  using Index = PropertyList::Index;
  struct Known {
    std::size_t place;
    // Retained, so that no other object gets its address.
    Ref<Object> object;
    // 0 while the object is being encoded.
    std::size_t size;
  };

  // Returns the index of a reference to `object`. Archives `object` if it is not archived yet.
  Index reference(const Ref<Object>& object);
  Index contentOf(const Ref<Object>& object);
  PropertyList::Dictionary partsOf(const SecureCoding& object);
  PropertyList::Dictionary partsOfCollection(const Object& object);
  Index listOf(const std::vector<Ref<Object>>& objects);
  Index classReference(const ClassInfo& info);
  Index referenceTo(std::size_t place);
  Index text(std::string_view text);

  KeyedArchiver& archiver_;
  PropertyList list_;
  // The value of "$objects".
  PropertyList::Array places_;
  // The objects that are being encoded, from the top down.
  std::vector<PropertyList::Dictionary> dictionaries_;
  std::unordered_map<const Object*, Known> known_;
  // The places of strings, by their texts.
  std::unordered_map<Index, std::size_t> strings_;
  std::unordered_map<const ClassInfo*, Index> classes_;
  std::unordered_map<std::size_t, Index> references_;
  std::map<std::string, Index, std::less<>> texts_;
  // Sizes are counted as detail::keyedArchive::maximumSize says. `size_` is what has been counted of the
  // object that is being encoded, and `largestSize_` is the size of the largest object at the top.
  std::size_t size_ = 0;
  std::size_t largestSize_ = 0;
  // How many calls of `encodeObject` have begun and not ended without an exception.
  std::size_t unfinished_ = 0;
};

KeyedArchiver::Encoder::Encoder(KeyedArchiver& archiver) : archiver_(archiver), dictionaries_(1) {
  places_.push_back(text(kNull));
}

void KeyedArchiver::Encoder::encodeObject(const Ref<Object>& object, std::string_view key) {
  // An exception leaves it incremented for good.
  ++unfinished_;
  const Index keyIndex = text(escaped(key));
  const auto isSame = [keyIndex](const auto& entry) { return entry.first == keyIndex; };
  if (std::ranges::any_of(dictionaries_.back(), isSame)) {
    fail("there is something under the key \"" + std::string(key) + "\" already");
  }
  const bool isAtTop = dictionaries_.size() == 1;
  if (isAtTop) size_ = 0;
  // First, since this may move the dictionary.
  const Index valueIndex = reference(object);
  if (isAtTop) largestSize_ = std::max(largestSize_, size_);
  dictionaries_.back().emplace_back(keyIndex, valueIndex);
  --unfinished_;
}

std::vector<std::byte> KeyedArchiver::Encoder::encodedData() {
  if (unfinished_ != 0) fail("an object is being encoded, or could not be");
  // The values around the objects are in the list for the time of this call. More objects may be encoded
  // later.
  struct Around {
    ~Around() { values.resize(count); }
    std::vector<PropertyList::Value>& values;
    const std::size_t count = values.size();
  };
  const Around around{.values = list_.values};
  PropertyList& list = list_;
  PropertyList::Dictionary root;
  const auto add = [&](Index key, PropertyList::Value value) {
    root.emplace_back(key, list.add(std::move(value)));
  };
  const Index version = list.add(PropertyList::Text(kVersionKey));
  add(version, kVersion);
  const Index archiver = list.add(PropertyList::Text(kArchiverKey));
  add(archiver, "KeyedArchiver");
  const Index top = list.add(PropertyList::Text(kTopKey));
  add(top, dictionaries_.front());
  const Index objects = list.add(PropertyList::Text(kObjectsKey));
  add(objects, places_);
  list.root = list.add(std::move(root));
  std::vector<std::byte> bytes = list.encoded();
  if (largestSize_ > maximumSize(bytes.size())) fail("objects are referred to too often");
  return bytes;
}

KeyedArchiver::Encoder::Index KeyedArchiver::Encoder::reference(const Ref<Object>& object) {
  if (object == nullptr) return referenceTo(0);
  if (const auto* string = cast<StringObject>(object.get())) {
    // Equal strings become one: they cannot be told apart.
    const Index content = text(string->view());
    const auto [known, isNew] = strings_.try_emplace(content, places_.size());
    if (isNew) places_.push_back(content);
    size_ = sum(size_, 1 + string->view().size());
    return referenceTo(known->second);
  }
  const auto [known, isNew] = known_.try_emplace(object.get(), Known{places_.size(), object, 0});
  const std::size_t place = known->second.place;
  if (isNew) {
    const std::size_t sizeBefore = std::exchange(size_, 1);
    places_.push_back(0);
    places_[place] = contentOf(object);
    known_.at(object.get()).size = size_;
    size_ = sum(sizeBefore, size_);
  } else if (known->second.size == 0) {
    fail("an object of class " + std::string(object->classInfo().name) + " contains itself");
  } else {
    size_ = sum(size_, known->second.size);
  }
  return referenceTo(place);
}

KeyedArchiver::Encoder::Index KeyedArchiver::Encoder::contentOf(const Ref<Object>& object) {
  if (const auto* number = cast<Number>(object.get())) return list_.add(valueOf(*number));
  if (dictionaries_.size() > kMaximumDepth) fail("objects are nested too deeply");
  const auto* coding = cast<SecureCoding>(object.get());
  PropertyList::Dictionary parts = coding != nullptr ? partsOf(*coding) : partsOfCollection(*object);
  const Index key = text(kClassKey);
  const bool isArray = coding == nullptr && object->isKindOf(classInfo<Array>());
  parts.emplace_back(key, classReference(isArray ? classInfo<Array>() : object->classInfo()));
  return list_.add(std::move(parts));
}

PropertyList::Dictionary KeyedArchiver::Encoder::partsOf(const SecureCoding& object) {
  dictionaries_.emplace_back();
  object.encodeWithCoder(archiver_);
  PropertyList::Dictionary parts = std::move(dictionaries_.back());
  dictionaries_.pop_back();
  return parts;
}

PropertyList::Dictionary KeyedArchiver::Encoder::partsOfCollection(const Object& object) {
  std::vector<Ref<Object>> keys;
  std::vector<Ref<Object>> elements;
  const auto* dictionary = cast<Dictionary>(&object);
  if (const auto* array = cast<Array>(&object)) {
    elements.assign(array->begin(), array->end());
  } else if (dictionary != nullptr) {
    for (const auto& entry : *dictionary) {
      if (!entry.first->isKindOf(classInfo<StringObject>()) && !entry.first->isKindOf(classInfo<Number>())) {
        fail("a Dictionary with a key of class " + std::string(entry.first->classInfo().name) +
             " cannot be archived");
      }
      keys.push_back(entry.first);
    }
    std::ranges::sort(keys, isBefore);
    for (const Ref<Object>& key : keys) elements.emplace_back(dictionary->objectForKey(key.get()));
  } else {
    fail("an object of class " + std::string(object.classInfo().name) + " cannot be archived");
  }

  // Nothing is encoded under a key here, but a collection counts as a level.
  dictionaries_.emplace_back();
  PropertyList::Dictionary parts;
  if (dictionary != nullptr) {
    const Index list = listOf(keys);
    parts.emplace_back(text(kKeysKey), list);
  }
  const Index list = listOf(elements);
  parts.emplace_back(text(kElementsKey), list);
  dictionaries_.pop_back();
  return parts;
}

KeyedArchiver::Encoder::Index KeyedArchiver::Encoder::listOf(const std::vector<Ref<Object>>& objects) {
  PropertyList::Array references;
  references.reserve(objects.size());
  for (const Ref<Object>& object : objects) references.push_back(reference(object));
  return list_.add(std::move(references));
}

KeyedArchiver::Encoder::Index KeyedArchiver::Encoder::classReference(const ClassInfo& info) {
  const auto known = classes_.find(&info);
  if (known != classes_.end()) return known->second;
  PropertyList::Array names;
  for (const ClassInfo* each = &info; each != nullptr; each = each->superclass) {
    names.push_back(text(each->name));
  }
  const Index classes = list_.add(names);
  const Index nameKey = text(kClassNameKey);
  const Index classesKey = text(kClassesKey);
  places_.push_back(list_.add(PropertyList::Dictionary{{nameKey, names.front()}, {classesKey, classes}}));
  return classes_[&info] = referenceTo(places_.size() - 1);
}

KeyedArchiver::Encoder::Index KeyedArchiver::Encoder::referenceTo(std::size_t place) {
  const auto [known, isNew] = references_.try_emplace(place, 0);
  if (isNew) known->second = list_.add(PropertyList::Reference{place});
  return known->second;
}

KeyedArchiver::Encoder::Index KeyedArchiver::Encoder::text(std::string_view text) {
  const auto known = texts_.find(text);
  if (known != texts_.end()) return known->second;
  const Index index = list_.add(PropertyList::Text(text));
  texts_.emplace(text, index);
  return index;
}

KeyedArchiver::KeyedArchiver() : encoder_(new Encoder(*this)) {}

KeyedArchiver::~KeyedArchiver() {
  delete encoder_;
}

void KeyedArchiver::encodeObject(const Ref<Object>& object, std::string_view key) {
  encoder_->encodeObject(object, key);
}

std::vector<std::byte> KeyedArchiver::encodedData() {
  return encoder_->encodedData();
}

std::vector<std::byte> KeyedArchiver::archivedDataWithRootObject(const Ref<Object>& object) {
  KeyedArchiver archiver;
  archiver.encodeObject(object, kRootKey);
  return archiver.encodedData();
}

}  // namespace rt
