#pragma once

/// Turns objects, and all that they are made of, into bytes.
///
///     rt::Ref<rt::Array> tags = rt::Array::of("Ann"_s, "the left window"_s);
///     rt::KeyedArchiver archiver;
///     archiver.encodeObject(tags, "kTagsID");
///     std::vector<std::byte> bytes = archiver.encodedData();
///
///     bytes = rt::KeyedArchiver::archivedDataWithRootObject(tag);          // under the key "root"
///
/// Strings, numbers, arrays, dictionaries with keys that are strings or numbers, and whatever conforms to
/// `SecureCoding` (Runtime/Archive/Coding.h) can be archived, nested in each other up to 512 deep. An object
/// that is reached twice is archived once, and is one object again when it is read; equal strings become one.
///
/// The size of what is under a key at the top must be at most 16 MiB more than 16 times that of the archive,
/// if each object and each byte of a text is counted as often as it is reached: what is larger is not read.
///
/// The bytes are a binary property list (Runtime/Archive/Private/PropertyList.h): a dictionary of
/// "$archiver",
/// "$version" 100000, "$top" with a reference for each key, and "$objects", to whose places references refer.
/// Strings and numbers stand there as themselves and "$null" in the first place. All others are dictionaries,
/// where "$class" refers to a class, a dictionary of "$classname" and "$classes", the names from the class up
/// to Object. Array and Dictionary have their elements under "objects", Dictionary its keys under "keys".
///
/// An archiver is used by one thread at a time.
///
/// Not for: objects that refer to each other in a circle; what other programs shall read without knowing
/// the classes.

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
  /// With nothing in it.
  KeyedArchiver();
  KeyedArchiver(const KeyedArchiver&) = delete;
  KeyedArchiver& operator=(const KeyedArchiver&) = delete;
  ~KeyedArchiver();

  /// Archives `object`, or that there is none where it is null, under `key`: as part of the object whose
  /// `encodeWithCoder` is running, and at the top outside any. Calls the `encodeWithCoder` of `object` and
  /// of what that encodes in turn.
  ///
  /// Throws rt::Exception when an object cannot be archived, contains itself or is nested too deeply, or
  /// when there is something under `key` already; and what an `encodeWithCoder` throws. After an exception
  /// the archiver is of no use.
  void encodeObject(const Ref<Object>& object, std::string_view key);

  /// The archive. Throws std::invalid_argument when a key is not UTF-8, and rt::Exception when objects are
  /// reached too often, after an earlier exception, and while an object is being encoded.
  std::vector<std::byte> encodedData();

  /// An archive with `object`, which may be null, under the key "root". Throws as the functions above.
  static std::vector<std::byte> archivedDataWithRootObject(const Ref<Object>& object);

 private:
  using Index = PropertyList::Index;
  struct Known {
    std::size_t place;
    // Kept, so that no other object comes to be at its address.
    Ref<Object> object;
    // 0 while the object is being encoded.
    std::size_t size;
  };

  // The index of a reference to `object`, which is archived if it is not yet.
  Index reference(const Ref<Object>& object);
  Index contentOf(const Ref<Object>& object);
  PropertyList::Dictionary partsOf(const SecureCoding& object);
  PropertyList::Dictionary partsOfCollection(const Object& object);
  Index listOf(const std::vector<Ref<Object>>& objects);
  Index classReference(const ClassInfo& info);
  Index referenceTo(std::size_t place);
  Index text(std::string_view text);

  PropertyList list_;
  // What is under "$objects".
  PropertyList::Array places_;
  // What is being encoded, from the top down.
  std::vector<PropertyList::Dictionary> dictionaries_;
  std::unordered_map<const Object*, Known> known_;
  // The places of strings, by their texts.
  std::unordered_map<Index, std::size_t> strings_;
  std::unordered_map<const ClassInfo*, Index> classes_;
  std::unordered_map<std::size_t, Index> references_;
  std::map<std::string, Index, std::less<>> texts_;
  // Sizes are as detail::keyedArchive::maximumSize says: what there is so far of the object that is being
  // encoded, and the largest at the top.
  std::size_t size_ = 0;
  std::size_t largestSize_ = 0;
  // How many calls of `encodeObject` have not come to their end.
  std::size_t unfinished_ = 0;
};

}  // namespace rt
