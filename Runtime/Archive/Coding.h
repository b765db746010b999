#pragma once

/// The protocols of objects that can be archived in a keyed archive and read back from it.
///
///     class Tag final : public rt::Implements<Tag, rt::Object, rt::SecureCoding> {
///      public:
///       explicit Tag(rt::String name) : name_(std::move(name)) {}
///       void encodeWithCoder(rt::KeyedArchiver& coder) const override { coder.encodeObject(name_, "name"); }
///       static rt::Ref<Tag> initWithCoder(rt::KeyedUnarchiver& coder) {
///         const rt::String name = coder.decodeString("name");
///         return name ? rt::make<Tag>(name) : nullptr;
///       }
///      private:
///       rt::String name_;
///     };
///
///     template struct rt::AddedClassMethod<Tag, "initWithCoder:", &rt::initWithCoder<Tag>>;
///
/// The last line stands in a source file, outside of any namespace. It lets a reader find `initWithCoder`
/// by the class's name in the archive. `initWithCoder` returns a new object, or null if the archive does
/// not have what the object needs.
///
/// Strings, numbers, arrays and dictionaries can be archived without this protocol.
///
/// Not for: text for people, which is an object's `description`.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/ClassMethod.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"

namespace rt {

class KeyedArchiver;
class KeyedUnarchiver;

/// An object that can be archived.
struct RT_VISIBLE Coding : Protocol<Coding> {
  /// Encodes the object's parts with `coder`, each under a key of its own. Must not keep a reference to
  /// `coder`. An exception ends the archiving.
  virtual void encodeWithCoder(KeyedArchiver& coder) const = 0;

 protected:
  ~Coding() = default;
};

/// An object whose class can read an archive from an untrusted source: its `initWithCoder` names the
/// classes that each part may have. Only such objects are archived.
struct RT_VISIBLE SecureCoding : Protocol<SecureCoding, Coding> {
 protected:
  ~SecureCoding() = default;
};

/// Reads a T. This is the function to add to the class T under "initWithCoder:".
template <ClassType T>
Ref<Object> initWithCoder(KeyedUnarchiver& coder) {
  return T::initWithCoder(coder);
}

}  // namespace rt
