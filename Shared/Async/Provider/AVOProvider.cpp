#include "Shared/Async/Provider/AVOProvider.h"

#include "Libraries/Util/ErrorHandler/PECReport.h"

using namespace rt::literals;

namespace {
constexpr const char* kFile = "Shared/Async/Provider/AVOProvider";
}

rt::Ref<AVOProvider> AVOProvider::providerWithBlock(ProviderBlock block) {
  return initWithBlock(std::move(block));
}

rt::Ref<AVOProvider> AVOProvider::providerWithObject(rt::Ref<rt::Object> object) {
  return providerWithBlock([object = std::move(object)] { return object; });
}

rt::Ref<AVOProvider> AVOProvider::init() {
  return rt::Ref<AVOProvider>::adopt(new AVOProvider(nullptr));
}

rt::Ref<AVOProvider> AVOProvider::initWithBlock(ProviderBlock block) {
  if (!block) {
    PECReport({kFile, "-[AVOProvider initWithBlock:]"}, "AVOProvider expects a block."_s);
    return nullptr;
  }
  return rt::Ref<AVOProvider>::adopt(new AVOProvider(std::move(block)));
}

rt::Ref<rt::Object> AVOProvider::get() const {
  return block_ ? block_() : nullptr;
}
