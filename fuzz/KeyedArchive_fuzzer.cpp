// Reads keyed archives, writes the objects, and reads them again, which must give the same archive. Writing
// may fail only if the new archive is so short that its objects are referred to too often.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <span>
#include <string_view>
#include <vector>

#include "Runtime/Archive/Coding.h"
#include "Runtime/Archive/KeyedArchiver.h"
#include "Runtime/Archive/KeyedUnarchiver.h"
#include "Runtime/Archive/PropertyList.h"
#include "Runtime/Objects/Exception.h"
#include "Runtime/Values/Array.h"
#include "Runtime/Values/Dictionary.h"

namespace {

class Tag final : public rt::Implements<Tag, rt::Object, rt::SecureCoding> {
 public:
  Tag(rt::String name, rt::Ref<rt::Object> other) : name_(std::move(name)), other_(std::move(other)) {}
  void encodeWithCoder(rt::KeyedArchiver& coder) const override {
    coder.encodeObject(name_, "name");
    if (other_) coder.encodeObject(other_, "other");
  }
  static rt::Ref<Tag> initWithCoder(rt::KeyedUnarchiver& coder) {
    rt::String name = coder.decodeString("name");
    rt::Ref<rt::Object> other;
    if (coder.containsValueForKey("other")) {
      other = coder.decodeObjectOfClasses({&rt::classInfo<Tag>(), &rt::classInfo<rt::Array>()}, "other");
    }
    return rt::make<Tag>(std::move(name), std::move(other));
  }

 private:
  rt::String name_;
  rt::Ref<rt::Object> other_;
};

void require(bool condition) {
  if (!condition) std::abort();
}

}  // namespace

template struct rt::AddedClassMethod<Tag, "initWithCoder:", &rt::initWithCoder<Tag>>;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  // A copy of exactly this size, so that the sanitizer notices reads past the end.
  const std::span<const std::byte> given = std::as_bytes(std::span(data, size));
  const std::vector<std::byte> bytes(given.begin(), given.end());
  try {
    const std::vector<std::byte> again = rt::PropertyList::decoded(bytes).encoded();
    require(rt::PropertyList::decoded(again).encoded() == again);
  } catch (const rt::MalformedPropertyList&) {
    return 0;
  }

  rt::String error;
  const rt::Ref<rt::Object> object =
      rt::KeyedUnarchiver::unarchivedObjectOfClasses({&rt::classInfo<rt::Object>()}, bytes, &error);
  require(!object || error.isNull());
  if (!object) return 0;
  // Compares archives and not objects, since a few bytes can stand for millions of objects.
  std::vector<std::byte> first;
  try {
    first = rt::KeyedArchiver::archivedDataWithRootObject(object);
  } catch (const rt::Exception& exception) {
    require(std::string_view(exception.what()).ends_with("objects are referred to too often"));
    return 0;
  }
  const rt::Ref<rt::Object> read =
      rt::KeyedUnarchiver::unarchivedObjectOfClasses({&rt::classInfo<rt::Object>()}, first, &error);
  require(read != nullptr);
  require(rt::KeyedArchiver::archivedDataWithRootObject(read) == first);
  return 0;
}
