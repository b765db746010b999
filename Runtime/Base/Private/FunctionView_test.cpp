#include "Runtime/Base/Private/FunctionView.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <type_traits>
#include <utility>

namespace {

using rt::FunctionView;

int twice(FunctionView<int(int)> function, int value) {
  return function(function(value));
}

TEST(FunctionView, CallsWhatItRefersTo) {
  int calls = 0;
  auto counting = [&calls, own = 0](int value) mutable {
    ++calls;
    return value + ++own;
  };
  EXPECT_EQ(twice(counting, 10), 13) << "not a copy of it";
  EXPECT_EQ(twice(counting, 10), 17);
  EXPECT_EQ(calls, 4);
  EXPECT_EQ(twice([](int value) { return value * value; }, 3), 81);
  int (*const pointer)(int) = [](int value) { return -value; };
  EXPECT_EQ(twice(pointer, 3), 3);
}

TEST(FunctionView, CallsAConstantObjectAsOne) {
  struct Function {
    std::string operator()() { return "changed"; }
    std::string operator()() const { return "constant"; }
  };
  Function changeable;
  const Function constant;
  EXPECT_EQ(FunctionView<std::string()>(changeable)(), "changed");
  EXPECT_EQ(FunctionView<std::string()>(constant)(), "constant");
}

TEST(FunctionView, ConvertsResultsAndPassesArgumentsOn) {
  const auto length = [](std::unique_ptr<std::string> text) { return text->size(); };
  const FunctionView<int(std::unique_ptr<std::string>)> asInteger = length;
  EXPECT_EQ(asInteger(std::make_unique<std::string>("four")), 4);
  const FunctionView<void(std::unique_ptr<std::string>)> dropped = length;
  dropped(std::make_unique<std::string>());
}

TEST(FunctionView, CopiesReferToTheSame) {
  int calls = 0;
  const auto count = [&] { ++calls; };
  const FunctionView<void()> first = count;
  FunctionView<void()> second = first;
  second();
  second = [] {};
  first();
  EXPECT_EQ(calls, 2);
  static_assert(!std::is_constructible_v<FunctionView<int()>, void (*)()>);
  static_assert(!std::is_constructible_v<FunctionView<void()>, int>);
}

}  // namespace
