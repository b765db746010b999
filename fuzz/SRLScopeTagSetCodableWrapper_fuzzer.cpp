// Reads archives of tag sets, writes the tag set, and reads it again, which must give an equal one. Writing
// may fail only if the new archive is so short that its objects are referred to too often.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <map>
#include <span>
#include <string_view>
#include <utility>
#include <vector>

#include "Libraries/Util/ErrorHandler/PECErrorHandler.h"
#include "Runtime/Archive/Coding.h"
#include "Runtime/Archive/KeyedArchiver.h"
#include "Runtime/Archive/KeyedUnarchiver.h"
#include "Runtime/Objects/Exception.h"
#include "Runtime/Values/Array.h"
#include "Runtime/Values/Dictionary.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMLogDropAllFilter.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/LUMSystemLogger.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTag.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSetCodableWrapper.h"

namespace {

using rt::Ref;
using Wrapper = SRLScopeTagSetCodableWrapper;

// A class of tags as a host may define it.
class Tag final : public rt::Implements<Tag, rt::Object, SRLScopeTag, rt::SecureCoding> {
 public:
  explicit Tag(rt::String name) : name_(std::move(name)) {}
  void encodeWithCoder(rt::KeyedArchiver& coder) const override { coder.encodeObject(name_, "name"); }
  static Ref<Tag> initWithCoder(rt::KeyedUnarchiver& coder) {
    const rt::String name = coder.decodeString("name");
    return name ? rt::make<Tag>(name) : nullptr;
  }
  bool isEqual(const rt::Object* other) const override {
    const auto* tag = rt::cast<Tag>(other);
    return tag != nullptr && tag->name_ == name_;
  }
  std::uint64_t hash() const override { return name_.hash(); }

 private:
  const rt::String name_;
};

void require(bool condition) {
  if (!condition) std::abort();
}

// Counts the objects that a comparison visits, up to a limit, since a few bytes can stand for millions of
// objects.
class Size {
 public:
  static constexpr std::size_t kLimit = 10'000;

  std::size_t of(const rt::Object* object) {
    if (const auto known = known_.find(object); known != known_.end()) return known->second;
    std::size_t size = 1;
    const auto add = [&](const rt::Object* part) { size = std::min(kLimit, size + of(part)); };
    if (const auto* array = rt::cast<rt::Array>(object)) {
      for (const Ref<rt::Object>& element : *array) add(element.get());
    } else if (const auto* dictionary = rt::cast<rt::Dictionary>(object)) {
      for (const auto& [key, value] : *dictionary) add(value.get());
    } else if (const auto* wrapper = rt::cast<Wrapper>(object)) {
      add(wrapper->tags().get());
    }
    return known_[object] = size;
  }

 private:
  std::map<const rt::Object*, std::size_t> known_;
};

Ref<Wrapper> read(std::span<const std::byte> bytes) {
  rt::String error;
  const Ref<Wrapper> wrapper = rt::KeyedUnarchiver::unarchivedObjectOfClass<Wrapper>(bytes, &error);
  require(!wrapper || (error.isNull() && wrapper->tags()));
  return wrapper;
}

}  // namespace

template struct rt::AddedClassMethod<Tag, "initWithCoder:", &rt::initWithCoder<Tag>>;

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  // Reports pass through the error handler and the multiplexer, and the filter drops them.
  LUMLogMultiplexer::sharedInstance()->addSyncLogger(
      LUMSystemLogger::initWithFilter(LUMLogDropAllFilter::init()));
  PECErrorHandler::sharedInstance()->setErrorHandlerBlock([](const Ref<PECErrorDescription>&) {});
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  // A copy of exactly this size, so that the sanitizer notices reads past the end.
  const std::span<const std::byte> given = std::as_bytes(std::span(data, size));
  const Ref<Wrapper> wrapper = read(std::vector<std::byte>(given.begin(), given.end()));
  if (!wrapper) return 0;
  std::vector<std::byte> archive;
  try {
    archive = rt::KeyedArchiver::archivedDataWithRootObject(wrapper);
  } catch (const rt::Exception& exception) {
    require(std::string_view(exception.what()).ends_with("objects are referred to too often"));
    return 0;
  }
  const Ref<Wrapper> again = read(archive);
  require(again != nullptr);
  require(rt::KeyedArchiver::archivedDataWithRootObject(again) == archive);
  if (Size().of(wrapper.get()) == Size::kLimit) return 0;
  require(rt::isEqual(again, wrapper));
  require(again->hash() == wrapper->hash());
  require(again->description().length() > 0);
  return 0;
}
