#include "Shared/Logging/LUMLogScope.h"

LUMLogScope::LUMLogScope(const rt::Ref<LUMLogMetadata>& metadata)
    : metadata_(metadataWith(metadata)), scope_(metadata_.get()) {}

rt::Ref<LUMLogMetadata> LUMLogScope::current() noexcept {
  return rt::cast<LUMLogMetadata>(rt::TaskContext::current());
}

rt::Ref<LUMLogMetadata> LUMLogScope::metadataWith(const rt::Ref<LUMLogMetadata>& metadata) {
  if (rt::TaskContext::current() == nullptr) return metadata;
  return LUMLogMetadata::metadataByMerging(current(), metadata);
}
