#pragma once

/// Makes objects of the bytes that a `KeyedArchiver` made of objects, or that anyone says it did.
///
///     rt::KeyedUnarchiver unarchiver(archive);
///     rt::Ref<rt::Array> tags = unarchiver.decodeObjectOfClass<rt::Array>("kTagsID");
///     if (!tags) report(unarchiver.error());
///
///     rt::String error;
///     rt::Ref<Tag> tag = rt::KeyedUnarchiver::unarchivedObjectOfClass<Tag>(archive, &error);
///
/// Who decodes says of which classes the object may be; an object of one that derives from one of these
/// will do. Nothing of an object is made before its class has been found to be among them and to conform
/// to `SecureCoding` (Runtime/Archive/Coding.h). In an array or dictionary, elements may be of the same
/// classes, and strings and numbers in any case.
///
/// Whatever the bytes are, the worst that they bring about is null and an error. Reading them takes time
/// and memory in proportion to how many they are, besides what `initWithCoder` of the classes takes and
/// unless keys of dictionaries are chosen to have the same hash. Once there is an error all further decoding
/// yields null, so that it is enough to look for one at the end.
///
/// The size of an object that is decoded is at most 16 MiB more than 16 times that of the archive, if each
/// object and each byte of a text that it is made of is counted as often as it is decoded: nobody waits for
/// its hash for ever. So `initWithCoder` should decode what is under a key once. A description may be longer
/// by far, since it indents what is nested, and should only be asked of what comes from somebody trusted.
///
/// An unarchiver is used by one thread at a time.
///
/// Not for: archives of other programs, whose classes are not known here
/// (Runtime/Archive/Private/PropertyList.h reads those).

#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "Runtime/Archive/Coding.h"
#include "Runtime/Archive/Private/PropertyList.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"

namespace rt {

class Array;

class KeyedUnarchiver final {
 public:
  /// Over an archive, which is not needed any more when this returns. If it is none, there is an error.
  /// Throws std::bad_alloc.
  explicit KeyedUnarchiver(std::span<const std::byte> bytes);
  KeyedUnarchiver(const KeyedUnarchiver&) = delete;
  KeyedUnarchiver& operator=(const KeyedUnarchiver&) = delete;
  ~KeyedUnarchiver();

  /// Whether there is something under `key`, be it null: in the object whose `initWithCoder` is running,
  /// and at the top outside any. False once there is an error.
  bool containsValueForKey(std::string_view key) const;

  /// What is under `key` there, if it is of one of `classes`. Null is yielded without an error where null
  /// was archived; with one, where there is nothing under the key, it is of another class, the object's
  /// own `initWithCoder` yielded null, or the archive contradicts itself or refers to objects too often.
  /// Calls `initWithCoder` of the object and of what that decodes in turn, once for each object; what it
  /// throws passes, and is no error.
  Ref<Object> decodeObjectOfClasses(std::span<const ClassInfo* const> classes, std::string_view key);
  Ref<Object> decodeObjectOfClasses(std::initializer_list<const ClassInfo*> classes, std::string_view key) {
    return decodeObjectOfClasses(std::span(classes.begin(), classes.size()), key);
  }

  /// The same for one class, T.
  template <ClassType T>
  Ref<T> decodeObjectOfClass(std::string_view key) {
    return cast<T>(decodeObjectOfClasses({&classInfo<T>()}, key));
  }

  /// An array, whose elements are of `classes`, or strings or numbers: unlike with `decodeObjectOfClasses`,
  /// an object of these classes that is no array is not made. With an error if there is another object.
  Ref<Array> decodeArrayOfObjectsOfClasses(std::initializer_list<const ClassInfo*> classes,
                                           std::string_view key);

  /// The same for a string.
  String decodeString(std::string_view key) {
    return String::from(decodeObjectOfClasses({&classInfo<StringObject>()}, key).get());
  }

  /// What first went wrong, for people; null as long as nothing has.
  const String& error() const noexcept { return error_; }

  /// The object under the key "root" of the archive `bytes`, of one of `classes`. Where it is null, `error`,
  /// if given, becomes what `error()` would be.
  static Ref<Object> unarchivedObjectOfClasses(std::initializer_list<const ClassInfo*> classes,
                                               std::span<const std::byte> bytes, String* error = nullptr);

  /// The same for one class, T.
  template <ClassType T>
  static Ref<T> unarchivedObjectOfClass(std::span<const std::byte> bytes, String* error = nullptr) {
    return cast<T>(unarchivedObjectOfClasses({&classInfo<T>()}, bytes, error));
  }

 private:
  using Index = PropertyList::Index;
  using Initializer = Ref<Object>(KeyedUnarchiver&);
  class Level;
  // Classes that an object may be of; those that were asked for once have a number.
  using Classes = std::vector<const ClassInfo*>;
  // What the object is wanted for, by numbers of classes: it may be of these, and its elements of those.
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

  // All of these yield null where they fail.
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

  PropertyList list_;
  // Values of `list_`: what is under "$objects", and the dictionary whose keys are decoded now.
  const PropertyList::Array* objects_ = nullptr;
  Index container_ = 0;
  std::size_t depth_ = 0;
  std::vector<Classes> classes_;
  std::unordered_map<std::uint64_t, Decoded> decoded_;
  // Sizes are as detail::keyedArchive::maximumSize says: that of all that has been decoded; what it may
  // become by the object at the top that is being decoded; and the most that one object may have.
  std::size_t size_ = 0;
  std::size_t sizeLimit_ = 0;
  const std::size_t maximumSize_;
  std::vector<bool> isDecoding_;
  std::unordered_map<Index, Index> listOwners_;
  // Of objects, and of what they refer to as their classes.
  std::unordered_map<Index, const ClassInfo*> classesOfObjects_;
  std::unordered_map<Index, const ClassInfo*> archivedClasses_;
  std::unordered_map<const ClassInfo*, Initializer*> initializers_;
  String error_;
};

}  // namespace rt
