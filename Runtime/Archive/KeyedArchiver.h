#pragma once

/// Turns objects and all their parts into bytes.
///
///     rt::Ref<rt::Array> tags = rt::Array::of("Ann"_s, "the left window"_s);
///     rt::KeyedArchiver archiver;
///     archiver.encodeObject(tags, "kTagsID");
///     std::vector<std::byte> bytes = archiver.encodedData();
///
///     bytes = rt::KeyedArchiver::archivedDataWithRootObject(tag);          // under the key "root"
///
/// Strings, numbers, arrays, dictionaries whose keys are strings or numbers, and objects that conform to
/// `SecureCoding` (Runtime/Archive/Coding.h) can be archived. They may be nested up to 512 deep. An object
/// that is reached twice is archived once, and is one object again when it is read. Equal strings become
/// one.
///
/// An object under a key at the top may have a size of 16 times that of the archive plus 16 MiB. Its size
/// counts each object and each byte of a text as often as it is reached. A larger object is refused, since
/// it would not be read.
///
/// The bytes are a binary property list (Runtime/Archive/Private/PropertyList.h). It is a dictionary with
/// these keys:
///
///     | "$archiver"   "KeyedArchiver"
///     | "$version"    100000
///     | "$top"        a dictionary, which has a reference for each key
///     | "$objects"    an array; references are indexes of it
///
/// In "$objects", "$null" comes first, and strings and numbers stand for themselves. All other objects are
/// dictionaries, in which "$class" refers to a class. A class is a dictionary of "$classname" and
/// "$classes", the names from the class up to Object. Array and Dictionary have their elements under
/// "objects", and Dictionary has its keys under "keys".
///
/// Threads: one thread at a time may use an archiver.
///
/// Not for: objects that refer to each other in a circle; archives for programs that do not know the
/// classes.

#include <cstddef>
#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "Runtime/Archive/Coding.h"
#include "Runtime/Archive/Private/PropertyList.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"

namespace rt {

class KeyedArchiver final {
 public:
  /// Makes an archiver without objects.
  KeyedArchiver();
  KeyedArchiver(const KeyedArchiver&) = delete;
  KeyedArchiver& operator=(const KeyedArchiver&) = delete;
  ~KeyedArchiver();

  /// Archives `object`, which may be null, under `key`. It becomes a part of the object whose
  /// `encodeWithCoder` is running, and at any other time it is at the top. Calls the `encodeWithCoder` of
  /// `object` and of its parts.
  ///
  /// Errors: throws rt::Exception if an object cannot be archived, contains itself or is nested too deeply,
  /// or if `key` is taken. Throws what an `encodeWithCoder` throws. After an exception the archiver is of
  /// no use.
  void encodeObject(const Ref<Object>& object, std::string_view key);

  /// Returns the archive. More objects may be encoded afterwards. Throws std::invalid_argument if a key is
  /// not UTF-8. Throws rt::Exception if an object is too large, after an earlier exception, and during an
  /// `encodeWithCoder`.
  std::vector<std::byte> encodedData();

  /// Returns an archive of `object`, which may be null, under the key "root". Throws like the functions
  /// above.
  static std::vector<std::byte> archivedDataWithRootObject(const Ref<Object>& object);

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

}  // namespace rt
