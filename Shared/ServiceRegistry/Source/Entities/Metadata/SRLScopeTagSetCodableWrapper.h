#pragma once

/// A tag set as an object, which can be archived and so passed to another process.
///
///     rt::Ref<SRLScopeTagSetCodableWrapper> wrapper = SRLScopeTagSetCodableWrapper::initWithTagSet(set);
///     std::vector<std::byte> bytes = rt::KeyedArchiver::archivedDataWithRootObject(wrapper);
///
///     rt::String error;
///     wrapper = rt::KeyedUnarchiver::unarchivedObjectOfClass<SRLScopeTagSetCodableWrapper>(bytes, &error);
///     if (wrapper) use(SRLScopeTagSetCreateWithTags(wrapper->tags().get()));
///
/// Tags are archived if they are strings or numbers, arrays or dictionaries, or conform to rt::SecureCoding
/// (Runtime/Archive/Coding.h); others end archiving with an rt::Exception, as does all else that a
/// KeyedArchiver refuses, also of what was unarchived. The archive has them in an array, under the key
/// "kTagsID".
///
/// An archive of a wrapper without an array of tags is reported. Without an error callback the report throws
/// an rt::InternalInconsistencyException, which passes through the unarchiver. So a host that unarchives
/// foreign bytes sets a callback (PECErrorHandler), or catches this.
///
/// Owns its tags. Immutable: any thread may use it if the tags bear that.
///
/// Not for: keys of tables, for which SRLScopeTagSet is smaller and quicker.

#include <cstdint>
#include <utility>

#include "Runtime/Archive/Coding.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Values/Array.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSet.h"

class RT_VISIBLE SRLScopeTagSetCodableWrapper final
    : public rt::Implements<SRLScopeTagSetCodableWrapper, rt::Object, rt::SecureCoding> {
 public:
  /// With a copy of `tags`, of any number. That it is null is reported, and yields null. Throws what the
  /// error callback throws, and std::bad_alloc.
  static rt::Ref<SRLScopeTagSetCodableWrapper> initWithTags(const rt::Ref<rt::Array>& tags);

  /// The same with the tags of `tagSet`.
  static rt::Ref<SRLScopeTagSetCodableWrapper> initWithTagSet(const SRLScopeTagSet& tagSet);

  /// The array under "kTagsID" in an archive. Nothing else is made of what is there. The elements may be of
  /// any class that can be unarchived, since hosts bring the classes of their tags. Where there is no array,
  /// or an element cannot be unarchived, the absence of tags is reported, and null is returned. The coder's
  /// `error` says what is wrong. Called by rt::KeyedUnarchiver.
  static rt::Ref<SRLScopeTagSetCodableWrapper> initWithCoder(rt::KeyedUnarchiver& coder);

  /// Archives the tags under "kTagsID". Throws what archiving them throws.
  void encodeWithCoder(rt::KeyedArchiver& coder) const override;

  /// That the class may be unarchived from anywhere.
  static constexpr bool supportsSecureCoding() noexcept { return true; }

  /// That between processes an object of the class is passed as a copy, not as a reference.
  static constexpr bool isValueType() noexcept { return true; }

  /// The tags, in the order of their slots; never null.
  const rt::Ref<rt::Array>& tags() const noexcept { return tags_; }

  /// Whether `other` has equal tags in the same order.
  bool isEqual(const rt::Object* other) const override;
  /// As SRLScopeTagSetHash of the tags, also of more than four.
  std::uint64_t hash() const override;
  /// "SRLScopeTagSetCodableWrapper<tags: TAGS>" with the array's description.
  rt::String description() const override;

 private:
  explicit SRLScopeTagSetCodableWrapper(rt::Ref<rt::Array> tags) noexcept : tags_(std::move(tags)) {}

  const rt::Ref<rt::Array> tags_;
};
