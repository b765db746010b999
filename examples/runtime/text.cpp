// Text: literals that allocate nothing, formats that are checked at compile time, and collections that
// describe themselves.

#include <cstdio>

#include "Runtime/Objects/String.h"
#include "Runtime/Text/Format.h"
#include "Runtime/Values/Array.h"
#include "Runtime/Values/Dictionary.h"
#include "Runtime/Values/Number.h"

using namespace rt::literals;

namespace {

void print(const rt::String& text) {
  std::printf("%.*s\n", static_cast<int>(text.length()), text.view().data());
}

}  // namespace

int main() {
  const rt::String name = rt::String::fromUTF8("  Ann \n").trimmed();
  print(rt::format("%@ is %d years old (%.1f %%)."_s, name, 41, 99.5));

  // Bytes that are not UTF-8 give a null string.
  if (rt::String::fromUTF8("\xff").isNull()) print("not UTF-8"_s);

  const rt::Ref<rt::Dictionary> person =
      rt::Dictionary::of({{"full name"_s, "Ann Smith"_s},
                          {"age"_s, rt::Number::of(41)},
                          {"children"_s, rt::Array::of("Bob"_s, "Zoe"_s)}});
  print(person->description());
}
