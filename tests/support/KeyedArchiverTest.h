#pragma once

// Classes for the tests of keyed archives. Some can be archived correctly, others misbehave.

#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <stdexcept>
#include <utility>
#include <vector>

#include "Runtime/Archive/Coding.h"
#include "Runtime/Archive/KeyedArchiver.h"
#include "Runtime/Archive/KeyedUnarchiver.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/ClassMethod.h"
#include "Runtime/Objects/Exception.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Values/Array.h"

class Plain final : public rt::Implements<Plain, rt::Object> {};

// A value class with a name and another object.
class Tag : public rt::Implements<Tag, rt::Object, rt::SecureCoding> {
 public:
  explicit Tag(rt::String name, rt::Ref<rt::Object> other = nullptr)
      : name_(std::move(name)), other_(std::move(other)) {}

  void encodeWithCoder(rt::KeyedArchiver& coder) const override {
    coder.encodeObject(name_, "$class");  // a key that the archive itself uses
    coder.encodeObject(other_, "other");
  }
  static rt::Ref<Tag> initWithCoder(rt::KeyedUnarchiver& coder) {
    ++initialized;
    const rt::String name = coder.decodeString("$class");
    rt::Ref<rt::Object> other =
        coder.decodeObjectOfClasses({&rt::classInfo<Tag>(), &rt::classInfo<rt::Array>()}, "other");
    return name ? rt::make<Tag>(name, other) : nullptr;
  }

  bool isEqual(const rt::Object* object) const override {
    const auto* tag = rt::cast<Tag>(object);
    return tag != nullptr && tag->name_ == name_ && rt::isEqual(tag->other_, other_);
  }
  std::uint64_t hash() const override { return name_.hash(); }
  const rt::Ref<rt::Object>& other() const { return other_; }
  void setOther(rt::Ref<rt::Object> other) { other_ = std::move(other); }

  static inline int initialized = 0;

 private:
  rt::String name_;
  rt::Ref<rt::Object> other_;
};

class ColoredTag final : public rt::Implements<ColoredTag, Tag> {
 public:
  using Implements::Implements;
  static rt::Ref<ColoredTag> initWithCoder(rt::KeyedUnarchiver& coder) {
    return rt::make<ColoredTag>(coder.decodeString("$class"));
  }
};

class OnlyCoding final : public rt::Implements<OnlyCoding, rt::Object, rt::Coding> {
 public:
  void encodeWithCoder(rt::KeyedArchiver& coder) const override { coder.encodeObject(nullptr, "key"); }
  static rt::Ref<OnlyCoding> initWithCoder(rt::KeyedUnarchiver&) {
    ADD_FAILURE() << "the object must not be decoded";
    return rt::make<OnlyCoding>();
  }
};

// Misbehaves in the way that `how_` names. When it is decoded, the archive supplies that name.
class Misbehaving final : public rt::Implements<Misbehaving, rt::Object, rt::SecureCoding> {
 public:
  explicit Misbehaving(rt::String how) : how_(std::move(how)) {}
  void encodeWithCoder(rt::KeyedArchiver& coder) const override {
    coder.encodeObject(how_, "how");
    if (how_ == "key twice") coder.encodeObject(how_, "how");
    if (how_ == "throw while encoding") throw std::runtime_error("thrown");
    if (how_ == "swallow") {
      try {
        coder.encodeObject(rt::make<Plain>(), "object");
      } catch (const rt::Exception&) {
        return;
      }
    }
    if (how_ == "finish early") coder.encodedData();
  }
  static rt::Ref<rt::Object> initWithCoder(rt::KeyedUnarchiver& coder) {
    const rt::String how = coder.decodeString("how");
    if (how == "throw") throw std::runtime_error("thrown");
    if (how == "another") return rt::make<Tag>(rt::String::fromUTF8("another"));
    if (how == "null") return nullptr;
    coder.decodeString("no such key");
    return rt::make<Misbehaving>(how);
  }

 private:
  rt::String how_;
};

template struct rt::AddedClassMethod<Tag, "initWithCoder:", &rt::initWithCoder<Tag>>;
template struct rt::AddedClassMethod<ColoredTag, "initWithCoder:", &rt::initWithCoder<ColoredTag>>;
template struct rt::AddedClassMethod<OnlyCoding, "initWithCoder:", &rt::initWithCoder<OnlyCoding>>;
template struct rt::AddedClassMethod<Misbehaving, "initWithCoder:", &rt::initWithCoder<Misbehaving>>;

inline const std::initializer_list<const rt::ClassInfo*> kAll{&rt::classInfo<rt::Object>()};

inline std::vector<std::byte> archive(const rt::Ref<rt::Object>& object) {
  return rt::KeyedArchiver::archivedDataWithRootObject(object);
}
