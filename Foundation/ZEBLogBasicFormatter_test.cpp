#include "Foundation/ZEBLogBasicFormatter.h"

#include <gtest/gtest.h>

#include <cstdarg>
#include <utility>

#include "Runtime/Values/Array.h"

namespace {

using namespace rt::literals;

rt::String format(const rt::String* withFormat, ...) {
  const auto formatter = rt::make<ZEBLogBasicFormatter>();
  std::va_list arguments;
  va_start(arguments, withFormat);
  const rt::String first = formatter->stringForFunc("func"_s, *withFormat, arguments, 3);
  // The list has not been advanced.
  const rt::String second = formatter->stringForFunc(nullptr, *withFormat, arguments, 0);
  va_end(arguments);
  EXPECT_EQ(first, second);
  return first;
}

TEST(ZEBLogBasicFormatter, AppliesTheFormatAndIgnoresFunctionAndLevel) {
  const rt::String text = "%@ has %d of %s%%"_s;
  const rt::Ref<rt::Array> array = rt::Array::of("a"_s);
  EXPECT_EQ(format(&text, static_cast<rt::Object*>(array.get()), 3, "five"), "(\n    a\n) has 3 of five%"_s);
  const rt::String empty = ""_s;
  EXPECT_EQ(format(&empty), ""_s);
}

TEST(ZEBLogBasicFormatter, ReturnsNullWithoutAFormat) {
  const rt::String none;
  EXPECT_TRUE(format(&none).isNull());
}

TEST(ZEBLogBasicFormatter, ReturnsNullWithoutArguments) {
  const auto formatter = rt::make<ZEBLogBasicFormatter>();
  EXPECT_TRUE(formatter->stringForFunc("func"_s, "format"_s, nullptr, 3).isNull());
}

TEST(ZEBLogBasicFormatter, FormatsFunctionNames) {
  const auto formatter = rt::make<ZEBLogBasicFormatter>();
  const std::pair<rt::String, rt::String> cases[] = {
      {"main"_s, "main()"_s},
      {" main\n"_s, "main()"_s},
      {"-[A b]"_s, "-[A b]"_s},
      {"+[A b:]"_s, "+[A b:]"_s},
      {"\t-[A b]\r\n"_s, "-[A b]"_s},
      {"-[A b] more"_s, "-[A b] more"_s},
      {"-"_s, "-()"_s},
      {"- [A b]"_s, "- [A b]()"_s},
      {"f(int)"_s, "f(int)"_s},
      {"f(int) "_s, "f(int)"_s},
      {"int f(int) const"_s, "int f(int) const()"_s},
      {")"_s, ")"_s},
      {"größe"_s, "größe()"_s},
      {nullptr, "(unknown)"_s},
      {""_s, "(unknown)"_s},
      {" \t\r\n\u00a0"_s, "(unknown)"_s},
  };
  for (const auto& [name, shown] : cases) {
    EXPECT_EQ(formatter->prettyNameForFunc(name), shown) << name.view();
  }
}

}  // namespace
