// The host decides which classes its tags have, long after this file was compiled. So the tags of an archive
// may be of any class that conforms to `SecureCoding`.

#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSetCodableWrapper.h"

#include <string_view>

#include "Libraries/Util/ErrorHandler/PECReport.h"
#include "Runtime/Text/Format.h"

using namespace rt::literals;

namespace {
constexpr const char* kFile = "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSetCodableWrapper";
constexpr std::string_view kTagsKey = "kTagsID";
}  // namespace

template struct rt::AddedClassMethod<SRLScopeTagSetCodableWrapper,
                                     "initWithCoder:", &rt::initWithCoder<SRLScopeTagSetCodableWrapper>>;

rt::Ref<SRLScopeTagSetCodableWrapper> SRLScopeTagSetCodableWrapper::initWithTags(
    const rt::Ref<rt::Array>& tags) {
  if (!tags) {
    PECReport({kFile, "-[SRLScopeTagSetCodableWrapper initWithTags:]"},
              "SRLScopeTagSetCodableWrapper requires non-nil tags."_s);
    return nullptr;
  }
  return rt::Ref<SRLScopeTagSetCodableWrapper>::adopt(new SRLScopeTagSetCodableWrapper(rt::copy(tags)));
}

rt::Ref<SRLScopeTagSetCodableWrapper> SRLScopeTagSetCodableWrapper::initWithTagSet(
    const SRLScopeTagSet& tagSet) {
  return initWithTags(rt::make<rt::Array>(SRLScopeTagSetToArray(tagSet)));
}

rt::Ref<SRLScopeTagSetCodableWrapper> SRLScopeTagSetCodableWrapper::initWithCoder(
    rt::KeyedUnarchiver& coder) {
  return initWithTags(coder.decodeArrayOfObjectsOfClasses({&rt::classInfo<rt::Object>()}, kTagsKey));
}

void SRLScopeTagSetCodableWrapper::encodeWithCoder(rt::KeyedArchiver& coder) const {
  coder.encodeObject(tags_, kTagsKey);
}

bool SRLScopeTagSetCodableWrapper::isEqual(const rt::Object* other) const {
  if (this == other) return true;
  const auto* wrapper = rt::cast<SRLScopeTagSetCodableWrapper>(other);
  return wrapper != nullptr && rt::isEqual(wrapper->tags_, tags_);
}

std::uint64_t SRLScopeTagSetCodableWrapper::hash() const {
  std::uint64_t hash = kSRLScopeTagSetHashOfNone;
  for (const rt::Ref<rt::Object>& tag : *tags_) hash = hash * 41 + tag->hash();
  return hash;
}

rt::String SRLScopeTagSetCodableWrapper::description() const {
  return rt::format("%@<tags: %@>"_s, rt::String::overStatic(classInfo().name), tags_);
}
