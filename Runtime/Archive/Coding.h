#pragma once

/// The protocols of objects that can be put into a keyed archive and taken out of it again.
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
/// The last line stands in a source file, outside any namespace. By it, and by the class's name in the
/// archive, a reader finds `initWithCoder`, which returns a new object, or null where what it decodes is
/// not what it needs.
///
/// Strings, numbers, arrays and dictionaries can be archived without any of this.
///
/// Not for: text that people read (an object's `description`).

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/ClassMethod.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"

namespace rt {

class KeyedArchiver;
class KeyedUnarchiver;

/// An object that can be put into an archive.
struct RT_VISIBLE Coding : Protocol<Coding> {
  /// Has `coder` encode what the object is made of, each part under a key of its own. It must not keep
  /// `coder`. An exception ends the archiving.
  virtual void encodeWithCoder(KeyedArchiver& coder) const = 0;

 protected:
  ~Coding() = default;
};

/// An object whose class can be trusted with what stands in an archive from anywhere: its `initWithCoder`
/// asks for every part by the classes that it may have. Only such objects are archived.
struct RT_VISIBLE SecureCoding : Protocol<SecureCoding, Coding> {
 protected:
  ~SecureCoding() = default;
};

/// What to add to the class T under "initWithCoder:".
template <ClassType T>
Ref<Object> initWithCoder(KeyedUnarchiver& coder) {
  return T::initWithCoder(coder);
}

}  // namespace rt
