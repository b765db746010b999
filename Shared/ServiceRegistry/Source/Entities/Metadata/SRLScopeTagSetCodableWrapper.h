#pragma once

/// A tag set as an object that can be archived, and so passed to another process.
///
///     rt::Ref<SRLScopeTagSetCodableWrapper> wrapper = SRLScopeTagSetCodableWrapper::initWithTagSet(set);
///     std::vector<std::byte> bytes = rt::KeyedArchiver::archivedDataWithRootObject(wrapper);
///
///     rt::String error;
///     wrapper = rt::KeyedUnarchiver::unarchivedObjectOfClass<SRLScopeTagSetCodableWrapper>(bytes, &error);
///     if (wrapper) use(SRLScopeTagSetCreateWithTags(wrapper->tags().get()));
///
/// The archive holds the tags in an array, under the key "kTagsID". Tags can be archived if they are strings,
/// numbers, arrays or dictionaries, or conform to rt::SecureCoding (Runtime/Archive/Coding.h). Archiving
/// other tags throws an rt::Exception, as does everything else that rt::KeyedArchiver refuses. It may refuse
/// an unarchived wrapper, too.
///
/// Errors: unarchiving a wrapper without an array of tags is reported. Without an error callback the report
/// throws an rt::InternalInconsistencyException, which passes through the unarchiver. A host that unarchives
/// foreign bytes must set an error callback (PECErrorHandler) or catch this exception.
///
/// Ownership: the wrapper owns its tags.
///
/// Threads: immutable. Any thread may use it if the tags allow that.
///
/// Not for: keys of tables. SRLScopeTagSet is smaller and faster.

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
  /// Returns a wrapper of a copy of `tags`, which may be of any length.
  /// Errors: null is reported and yields null. Throws what the error callback throws, and std::bad_alloc.
  static rt::Ref<SRLScopeTagSetCodableWrapper> initWithTags(const rt::Ref<rt::Array>& tags);

  /// Returns a wrapper of the tags of `tagSet`. Throws std::bad_alloc.
  static rt::Ref<SRLScopeTagSetCodableWrapper> initWithTagSet(const SRLScopeTagSet& tagSet);

  /// Returns a wrapper of the array under "kTagsID" in an archive. Decodes nothing but an array there. Its
  /// elements may be of any class that can be unarchived, since hosts define the classes of their tags.
  /// rt::KeyedUnarchiver calls this function.
  /// Errors: if there is no array, or an element cannot be unarchived, this reports that the tags are missing
  /// and returns null. The coder's `error` says why.
  static rt::Ref<SRLScopeTagSetCodableWrapper> initWithCoder(rt::KeyedUnarchiver& coder);

  /// Archives the tags under "kTagsID". Throws what archiving a tag throws.
  void encodeWithCoder(rt::KeyedArchiver& coder) const override;

  /// Returns true: wrappers may be unarchived from bytes of any origin.
  static constexpr bool supportsSecureCoding() noexcept { return true; }

  /// Returns true: between processes, wrappers are passed by copy, not by reference.
  static constexpr bool isValueType() noexcept { return true; }

  /// Returns the tags in the order of the set. Never null.
  const rt::Ref<rt::Array>& tags() const noexcept { return tags_; }

  /// Returns whether `other` is a wrapper of equal tags in the same order.
  bool isEqual(const rt::Object* other) const override;
  /// Returns a hash that is computed like SRLScopeTagSetHash, also for more than four tags.
  std::uint64_t hash() const override;
  /// Returns "SRLScopeTagSetCodableWrapper<tags: TAGS>", where TAGS is the array's description.
  rt::String description() const override;

 private:
  explicit SRLScopeTagSetCodableWrapper(rt::Ref<rt::Array> tags) noexcept : tags_(std::move(tags)) {}

  const rt::Ref<rt::Array> tags_;
};
