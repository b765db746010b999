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
/// The bytes are a binary property list. It is a dictionary with these keys:
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
#include <string_view>
#include <vector>

#include "Runtime/Archive/Coding.h"
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
  // Defined in the source file, since most of what it needs is slow to parse.
  class Encoder;

  Encoder* const encoder_;
};

}  // namespace rt
