#include "Runtime/Archive/KeyedUnarchiver.h"

#include <algorithm>
#include <cstdint>
#include <optional>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

#include "Runtime/Archive/Private/KeyedArchiveFormat.h"
#include "Runtime/Archive/Private/PropertyList.h"
#include "Runtime/Objects/ClassMethod.h"
#include "Runtime/Values/Array.h"
#include "Runtime/Values/Dictionary.h"
#include "Runtime/Values/Number.h"

namespace rt {

namespace {

using namespace detail::keyedArchive;

// For error texts. A text from the archive may be long.
std::string quoted(std::string_view text) {
  constexpr std::size_t kMaximumLength = 100;
  return '"' + std::string(text.substr(0, kMaximumLength)) + (text.size() > kMaximumLength ? "...\"" : "\"");
}

}  // namespace

class KeyedUnarchiver::Decoder {
 public:
  // The functions of KeyedUnarchiver. `unarchiver` is the one that classes' `initWithCoder` gets.
  Decoder(KeyedUnarchiver& unarchiver, std::span<const std::byte> bytes);
  bool containsValueForKey(std::string_view key) const;
  Ref<Object> decodeObjectOfClasses(std::span<const ClassInfo* const> classes, std::string_view key);
  Ref<Array> decodeArrayOfObjectsOfClasses(std::span<const ClassInfo* const> classes, std::string_view key);
  const String& error() const noexcept { return error_; }

 private:
  using Index = PropertyList::Index;
  using Initializer = Ref<Object>(KeyedUnarchiver&);
  class Level;
  // The classes that an object may have. Each list that has been asked for has a number.
  using Classes = std::vector<const ClassInfo*>;
  // The numbers of two lists of classes: that for the object, and that for its elements.
  struct Wanted {
    std::size_t classes;
    std::size_t elements;
    bool isElement = false;
  };

  struct Decoded {
    Ref<Object> object;
    std::size_t size = 0;
  };

  std::size_t numberOf(std::span<const ClassInfo* const> classes);

  // All of these return null or false if they fail.
  Ref<Object> decode(std::string_view key, Wanted wanted);
  const PropertyList::Array* archivedObjects();
  Ref<Object> decodeReference(Index reference, Wanted wanted);
  Ref<Object> decodeValue(Index index, Wanted wanted);
  Ref<Object> decodePlain(Index index, Wanted wanted);
  Ref<Object> decodeInstance(Index index, Wanted wanted);
  Ref<Object> decodeWithCoder(const ClassInfo& info);
  Ref<Object> decodeCollection(Index index, const ClassInfo& info, Wanted wanted);
  Ref<Object> decodeDictionary(Index index, const std::vector<Ref<Object>>& elements, Wanted wanted);
  bool decodeList(Index owner, std::string_view key, Wanted wanted, std::vector<Ref<Object>>& objects);
  Initializer* initializerOf(const ClassInfo& info);
  const ClassInfo* classOf(Index index);
  const ClassInfo* archivedClass(Index index);
  bool isAllowed(const ClassInfo& info, Wanted wanted);
  bool grow(std::size_t size);
  Ref<Object> fail(const std::string& reason);

  KeyedUnarchiver& unarchiver_;
  PropertyList list_;
  // Values of `list_`: that of "$objects", and the dictionary whose keys are being decoded.
  const PropertyList::Array* objects_ = nullptr;
  Index container_ = 0;
  std::size_t depth_ = 0;
  std::vector<Classes> classes_;
  std::unordered_map<std::uint64_t, Decoded> decoded_;
  // Sizes are counted as detail::keyedArchive::maximumSize says. `size_` is that of all decoded objects,
  // `sizeLimit_` what `size_` may be when the current object at the top is decoded, and `maximumSize_` the
  // largest size of one object.
  std::size_t size_ = 0;
  std::size_t sizeLimit_ = 0;
  const std::size_t maximumSize_;
  std::vector<bool> isDecoding_;
  std::unordered_map<Index, Index> listOwners_;
  // The classes of objects, and the classes that archived classes stand for.
  std::unordered_map<Index, const ClassInfo*> classesOfObjects_;
  std::unordered_map<Index, const ClassInfo*> archivedClasses_;
  std::unordered_map<const ClassInfo*, Initializer*> initializers_;
  String error_;
};

// Makes an object the one whose keys are decoded, until the scope ends.
class KeyedUnarchiver::Decoder::Level {
 public:
  Level(Decoder& decoder, Index index) : decoder_(decoder), index_(index), container_(decoder.container_) {
    ++decoder_.depth_;
    decoder_.isDecoding_[index_] = true;
    decoder_.container_ = index_;
  }
  Level(const Level&) = delete;
  Level& operator=(const Level&) = delete;
  ~Level() {
    --decoder_.depth_;
    decoder_.isDecoding_[index_] = false;
    decoder_.container_ = container_;
  }

 private:
  Decoder& decoder_;
  const Index index_;
  const Index container_;
};

KeyedUnarchiver::Decoder::Decoder(KeyedUnarchiver& unarchiver, std::span<const std::byte> bytes)
    : unarchiver_(unarchiver), maximumSize_(detail::keyedArchive::maximumSize(bytes.size())) {
  try {
    list_ = PropertyList::decoded(bytes);
  } catch (const MalformedPropertyList& error) {
    fail(std::string("no keyed archive: ") + error.what());
    return;
  }
  objects_ = archivedObjects();
  isDecoding_.resize(list_.values.size());
}

const PropertyList::Array* KeyedUnarchiver::Decoder::archivedObjects() {
  const auto under = [this](std::string_view key) {
    // A missing key yields an index that no value has.
    return list_.find(list_.root, key).value_or(static_cast<Index>(list_.values.size()));
  };
  const auto* version = list_.get<std::int64_t>(under(kVersionKey));
  const auto* objects = list_.get<PropertyList::Array>(under(kObjectsKey));
  const auto* null =
      objects != nullptr && !objects->empty() ? list_.get<PropertyList::Text>(objects->front()) : nullptr;
  container_ = under(kTopKey);
  if (version == nullptr || *version != kVersion || null == nullptr || *null != kNull ||
      list_.get<PropertyList::Text>(under(kArchiverKey)) == nullptr ||
      list_.get<PropertyList::Dictionary>(container_) == nullptr) {
    fail("no keyed archive, but another property list");
    return nullptr;
  }
  return objects;
}

bool KeyedUnarchiver::Decoder::containsValueForKey(std::string_view key) const {
  return error_.isNull() && list_.find(container_, escaped(key)).has_value();
}

Ref<Object> KeyedUnarchiver::Decoder::decodeObjectOfClasses(std::span<const ClassInfo* const> classes,
                                                            std::string_view key) {
  const std::size_t number = numberOf(classes);
  return decode(key, {.classes = number, .elements = number});
}

Ref<Array> KeyedUnarchiver::Decoder::decodeArrayOfObjectsOfClasses(std::span<const ClassInfo* const> classes,
                                                                   std::string_view key) {
  const ClassInfo* const array = &classInfo<Array>();
  return cast<Array>(decode(key, {.classes = numberOf({&array, 1}), .elements = numberOf(classes)}));
}

std::size_t KeyedUnarchiver::Decoder::numberOf(std::span<const ClassInfo* const> classes) {
  Classes allowed(classes.begin(), classes.end());
  std::ranges::sort(allowed);
  const auto known = std::ranges::find(classes_, allowed);
  const auto number = static_cast<std::size_t>(known - classes_.begin());
  if (known == classes_.end()) classes_.push_back(std::move(allowed));
  return number;
}

Ref<Object> KeyedUnarchiver::Decoder::decode(std::string_view key, Wanted wanted) {
  if (!error_.isNull()) return nullptr;
  const std::optional<Index> index = list_.find(container_, escaped(key));
  if (!index) return fail("there is nothing under the key " + quoted(key));
  if (depth_ == 0) sizeLimit_ = size_ + maximumSize_;
  return decodeReference(*index, wanted);
}

Ref<Object> KeyedUnarchiver::Decoder::decodeReference(Index reference, Wanted wanted) {
  const auto* place = list_.get<PropertyList::Reference>(reference);
  if (place == nullptr || place->number >= objects_->size()) return fail("a reference to no object");
  if (place->number == 0) return nullptr;
  return decodeValue((*objects_)[place->number], wanted);
}

Ref<Object> KeyedUnarchiver::Decoder::decodeValue(Index index, Wanted wanted) {
  if (list_.get<PropertyList::Dictionary>(index) != nullptr) return decodeInstance(index, wanted);
  return decodePlain(index, wanted);
}

Ref<Object> KeyedUnarchiver::Decoder::decodePlain(Index index, Wanted wanted) {
  auto& [object, size] = decoded_[index];
  if (object == nullptr) {
    size = 1;
    if (const auto* text = list_.get<PropertyList::Text>(index)) {
      object = String::fromUTF8(*text);
      size += text->size();
    } else if (const auto* boolean = list_.get<bool>(index)) {
      object = Number::of(*boolean);
    } else if (const auto* integer = list_.get<std::int64_t>(index)) {
      object = Number::of(*integer);
    } else if (const auto* large = list_.get<std::uint64_t>(index)) {
      object = Number::of(*large);
    } else if (const auto* real = list_.get<double>(index)) {
      object = Number::of(*real);
    } else {
      return fail("an object that is neither text nor number, and has no class");
    }
  }
  if (!wanted.isElement && !isAllowed(object->classInfo(), wanted)) return nullptr;
  return grow(size) ? object : nullptr;
}

Ref<Object> KeyedUnarchiver::Decoder::decodeInstance(Index index, Wanted wanted) {
  const ClassInfo* info = classOf(index);
  if (info == nullptr || !isAllowed(*info, wanted)) return nullptr;
  const bool isCollection = info == &classInfo<Array>() || info == &classInfo<Dictionary>();
  // The classes that a collection's elements may have differ from call to call.
  const std::uint64_t key = index | (isCollection ? std::uint64_t{wanted.elements + 1} << 32U : 0);
  if (const auto known = decoded_.find(key); known != decoded_.end()) {
    return grow(known->second.size) ? known->second.object : nullptr;
  }
  if (isDecoding_[index]) return fail("an object of class " + quoted(info->name) + " contains itself");
  if (depth_ == kMaximumDepth) return fail("objects are nested too deeply");

  const std::size_t sizeBefore = size_;
  if (!grow(1)) return nullptr;
  Ref<Object> object;
  {
    const Level level(*this, index);
    object = isCollection ? decodeCollection(index, *info, wanted) : decodeWithCoder(*info);
  }
  if (!error_.isNull()) return nullptr;
  decoded_[key] = {object, size_ - sizeBefore};
  return object;
}

Ref<Object> KeyedUnarchiver::Decoder::decodeWithCoder(const ClassInfo& info) {
  Initializer* const initializer = initializerOf(info);
  if (initializer == nullptr) return fail("the class " + quoted(info.name) + " cannot be unarchived");
  Ref<Object> object = initializer(unarchiver_);
  if (object == nullptr) return fail("the class " + quoted(info.name) + " refused what is archived for it");
  if (!object->isKindOf(info)) return fail("the class " + quoted(info.name) + " made another object");
  return object;
}

Ref<Object> KeyedUnarchiver::Decoder::decodeCollection(Index index, const ClassInfo& info, Wanted wanted) {
  wanted = {.classes = wanted.elements, .elements = wanted.elements, .isElement = true};
  std::vector<Ref<Object>> elements;
  if (!decodeList(index, kElementsKey, wanted, elements)) return nullptr;
  if (&info == &classInfo<Array>()) return make<Array>(std::move(elements));
  return decodeDictionary(index, elements, wanted);
}

Ref<Object> KeyedUnarchiver::Decoder::decodeDictionary(Index index, const std::vector<Ref<Object>>& elements,
                                                       Wanted wanted) {
  std::vector<Ref<Object>> keys;
  if (!decodeList(index, kKeysKey, wanted, keys)) return nullptr;
  if (keys.size() != elements.size()) return fail("a Dictionary with more or fewer keys than elements");
  Dictionary::Builder builder;
  for (std::size_t i = 0; i < keys.size(); ++i) {
    // Collections as keys would be hashed again at each level, so a few bytes could stand for much work.
    if (!keys[i]->isKindOf(classInfo<StringObject>()) && !keys[i]->isKindOf(classInfo<Number>())) {
      return fail("a Dictionary with a key that is neither text nor number");
    }
    builder.set(keys[i], elements[i]);
  }
  if (builder.count() != keys.size()) return fail("a Dictionary with a key twice");
  return std::move(builder).dictionary();
}

bool KeyedUnarchiver::Decoder::decodeList(Index owner, std::string_view key, Wanted wanted,
                                          std::vector<Ref<Object>>& objects) {
  const std::optional<Index> index = list_.find(owner, key);
  const auto* references = index ? list_.get<PropertyList::Array>(*index) : nullptr;
  if (!index || references == nullptr) return fail("a collection without " + std::string(key)) != nullptr;
  // No archiver has two collections share a list. Many that did would multiply what a file holds.
  if (listOwners_.try_emplace(*index, owner).first->second != owner) {
    return fail("two collections with the same " + std::string(key)) != nullptr;
  }
  objects.reserve(references->size());
  for (const Index reference : *references) {
    objects.push_back(decodeReference(reference, wanted));
    if (error_.isNull() && objects.back() == nullptr) fail("a collection that contains null");
    if (!error_.isNull()) return false;
  }
  return true;
}

KeyedUnarchiver::Decoder::Initializer* KeyedUnarchiver::Decoder::initializerOf(const ClassInfo& info) {
  const auto [known, isNew] = initializers_.try_emplace(&info, nullptr);
  if (isNew && info.conformsTo(protocolInfo<SecureCoding>())) {
    for (const ClassMethod& method : classMethods(info)) {
      if (method.selector() == kInitializer) known->second = method.as<Initializer>();
    }
  }
  return known->second;
}

// The class is looked for once for each object, since an object may have many keys.
const ClassInfo* KeyedUnarchiver::Decoder::classOf(Index index) {
  const ClassInfo*& info = classesOfObjects_[index];
  if (info != nullptr) return info;
  const std::optional<Index> reference = list_.find(index, kClassKey);
  const auto* place = reference ? list_.get<PropertyList::Reference>(*reference) : nullptr;
  if (place != nullptr && place->number < objects_->size()) info = archivedClass((*objects_)[place->number]);
  if (info == nullptr) fail("an object without a class");
  return info;
}

// Here too, each class is looked for once.
const ClassInfo* KeyedUnarchiver::Decoder::archivedClass(Index index) {
  const ClassInfo*& info = archivedClasses_[index];
  if (info != nullptr) return info;
  const std::optional<Index> name = list_.find(index, kClassNameKey);
  const auto* text = name ? list_.get<PropertyList::Text>(*name) : nullptr;
  if (text == nullptr) return nullptr;
  info = classNamed(*text);
  if (info == nullptr) fail("an object of class " + quoted(*text) + ", which is not known here");
  return info;
}

bool KeyedUnarchiver::Decoder::isAllowed(const ClassInfo& info, Wanted wanted) {
  const Classes& classes = classes_[wanted.classes];
  if (std::ranges::any_of(classes, [&](const ClassInfo* each) { return info.isSubclassOf(*each); }))
    return true;
  std::string names;
  for (const ClassInfo* each : classes) names += (names.empty() ? "" : " or ") + quoted(each->name);
  fail("an object of class " + quoted(info.name) + " where one of class " + names + " was asked for");
  return false;
}

bool KeyedUnarchiver::Decoder::grow(std::size_t size) {
  size_ += size;
  if (size_ > sizeLimit_) fail("objects are referred to too often");
  return error_.isNull();
}

Ref<Object> KeyedUnarchiver::Decoder::fail(const std::string& reason) {
  if (error_.isNull()) error_ = String::fromUTF8Repaired(reason);
  return nullptr;
}

KeyedUnarchiver::KeyedUnarchiver(std::span<const std::byte> bytes) : decoder_(new Decoder(*this, bytes)) {}

KeyedUnarchiver::~KeyedUnarchiver() {
  delete decoder_;
}

bool KeyedUnarchiver::containsValueForKey(std::string_view key) const {
  return decoder_->containsValueForKey(key);
}

Ref<Object> KeyedUnarchiver::decodeObjectOfClasses(std::span<const ClassInfo* const> classes,
                                                   std::string_view key) {
  return decoder_->decodeObjectOfClasses(classes, key);
}

Ref<Array> KeyedUnarchiver::decodeArrayOfObjectsOfClasses(std::initializer_list<const ClassInfo*> classes,
                                                          std::string_view key) {
  return decoder_->decodeArrayOfObjectsOfClasses(std::span(classes.begin(), classes.size()), key);
}

const String& KeyedUnarchiver::error() const noexcept {
  return decoder_->error();
}

Ref<Object> KeyedUnarchiver::unarchivedObjectOfClasses(std::initializer_list<const ClassInfo*> classes,
                                                       std::span<const std::byte> bytes, String* error) {
  KeyedUnarchiver unarchiver(bytes);
  Ref<Object> object = unarchiver.decodeObjectOfClasses(classes, kRootKey);
  if (object == nullptr && error != nullptr) *error = unarchiver.error();
  return object;
}

}  // namespace rt
