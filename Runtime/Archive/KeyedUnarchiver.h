#pragma once

/// Reads objects from a keyed archive, which may come from an untrusted source.
///
///     rt::KeyedUnarchiver unarchiver(archive);
///     rt::Ref<rt::Array> tags = unarchiver.decodeObjectOfClass<rt::Array>("kTagsID");
///     if (!tags) report(unarchiver.error());
///
///     rt::String error;
///     rt::Ref<Tag> tag = rt::KeyedUnarchiver::unarchivedObjectOfClass<Tag>(archive, &error);
///
/// Each call names the classes that the object may have. Their subclasses are allowed as well. No part of
/// an object is made before its class is known to be allowed and to conform to `SecureCoding`
/// (Runtime/Archive/Coding.h). Elements of an array or dictionary may have the same classes, or be strings
/// or numbers.
///
/// Errors: malformed bytes yield null and an error, never undefined behaviour. After an error all further
/// calls yield null, so it is enough to ask for `error()` at the end.
///
/// Reading takes time and memory in proportion to the number of bytes. This does not count the time of the
/// classes' `initWithCoder`, nor dictionaries whose keys were chosen to have the same hash.
///
/// An object may have a size of 16 times that of the archive plus 16 MiB. Its size counts each object and
/// each byte of a text as often as it is decoded. So the time for its hash is bounded, and `initWithCoder`
/// should decode each key once. The description of an object may be much longer, since it indents what is
/// nested. Do not ask for the description of an object from an untrusted source.
///
/// Threads: one thread at a time may use an unarchiver.
///
/// Not for: archives of other programs, whose classes this program does not know. An archive with dates, data
/// or short real numbers is malformed, since KeyedArchiver writes none.

#include <cstddef>
#include <initializer_list>
#include <span>
#include <string_view>

#include "Runtime/Archive/Coding.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"

namespace rt {

class Array;

class KeyedUnarchiver final {
 public:
  /// Reads `bytes`. The unarchiver keeps no reference to them. If they are not an archive, `error()` says
  /// why. Throws std::bad_alloc.
  explicit KeyedUnarchiver(std::span<const std::byte> bytes);
  KeyedUnarchiver(const KeyedUnarchiver&) = delete;
  KeyedUnarchiver& operator=(const KeyedUnarchiver&) = delete;
  ~KeyedUnarchiver();

  /// Returns whether there is an object or null under `key`. Looks in the object whose `initWithCoder` is
  /// running, and at any other time at the top of the archive. Returns false after an error.
  bool containsValueForKey(std::string_view key) const;

  /// Returns the object under `key`, which must have one of `classes`. Looks where `containsValueForKey`
  /// does. Calls the `initWithCoder` of the object and of its parts, once for each object.
  ///
  /// Errors: returns null without an error if null was archived. Returns null with an error if there is
  /// nothing under the key, the object has another class, or its `initWithCoder` returns null. It also does
  /// so if the archive is inconsistent or refers to objects too often. An exception of `initWithCoder` passes
  /// to the caller and is no error.
  Ref<Object> decodeObjectOfClasses(std::span<const ClassInfo* const> classes, std::string_view key);
  Ref<Object> decodeObjectOfClasses(std::initializer_list<const ClassInfo*> classes, std::string_view key) {
    return decodeObjectOfClasses(std::span(classes.begin(), classes.size()), key);
  }

  /// Does the same for one class, T.
  template <ClassType T>
  Ref<T> decodeObjectOfClass(std::string_view key) {
    return cast<T>(decodeObjectOfClasses({&classInfo<T>()}, key));
  }

  /// Returns the array under `key`. Its elements must have one of `classes`, or be strings or numbers.
  /// Returns null with an error for an object that is not an array. Unlike `decodeObjectOfClasses`, this
  /// never makes an object of `classes` in the place of the array.
  Ref<Array> decodeArrayOfObjectsOfClasses(std::initializer_list<const ClassInfo*> classes,
                                           std::string_view key);

  /// Does the same as `decodeObjectOfClasses` for a string.
  String decodeString(std::string_view key) {
    return String::from(decodeObjectOfClasses({&classInfo<StringObject>()}, key).get());
  }

  /// Describes the first error, for people. Null if there is none.
  const String& error() const noexcept;

  /// Returns the object under the key "root" of the archive `bytes`, which must have one of `classes`. If it
  /// returns null, it sets `*error` to what `error()` would be, unless `error` is null.
  static Ref<Object> unarchivedObjectOfClasses(std::initializer_list<const ClassInfo*> classes,
                                               std::span<const std::byte> bytes, String* error = nullptr);

  /// Does the same for one class, T.
  template <ClassType T>
  static Ref<T> unarchivedObjectOfClass(std::span<const std::byte> bytes, String* error = nullptr) {
    return cast<T>(unarchivedObjectOfClasses({&classInfo<T>()}, bytes, error));
  }

 private:
  // Defined in the source file, since most of what it needs is slow to parse.
  class Decoder;

  Decoder* const decoder_;
};

}  // namespace rt
