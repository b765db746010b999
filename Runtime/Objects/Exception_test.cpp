#include "Runtime/Objects/Exception.h"

#include <gtest/gtest.h>

#include <type_traits>

namespace {

using namespace rt::literals;

TEST(Exception, CarriesItsNameAndReason) {
  const rt::Exception exception("Assertion Failed!"_s, "it was so"_s);
  EXPECT_EQ(exception.name(), "Assertion Failed!");
  EXPECT_EQ(exception.reason(), "it was so");
  EXPECT_STREQ(exception.what(), "Assertion Failed!: it was so");
}

TEST(Exception, AcceptsANullNameAndReason) {
  const rt::Exception exception(nullptr, nullptr);
  EXPECT_TRUE(exception.name().isNull());
  EXPECT_TRUE(exception.reason().isNull());
  EXPECT_STREQ(exception.what(), ": ");
}

TEST(Exception, IsCopiedWithoutThrowing) {
  static_assert(std::is_nothrow_copy_constructible_v<rt::Exception>);
  static_assert(std::is_nothrow_copy_constructible_v<rt::InternalInconsistencyException>);
}

TEST(InternalInconsistencyException, CarriesItsPlaceAndDescription) {
  try {
    throw rt::InternalInconsistencyException("main()"_s, "main.cpp"_s, 7, "must not be"_s);
  } catch (const rt::Exception& caught) {
    EXPECT_EQ(caught.name(), "InternalInconsistencyException");
    EXPECT_EQ(caught.reason(), "must not be");
    const auto& exception = static_cast<const rt::InternalInconsistencyException&>(caught);
    EXPECT_EQ(exception.function(), "main()");
    EXPECT_EQ(exception.file(), "main.cpp");
    EXPECT_EQ(exception.lineNumber(), 7U);
    EXPECT_EQ(exception.description(), "must not be");
  }
}

}  // namespace
