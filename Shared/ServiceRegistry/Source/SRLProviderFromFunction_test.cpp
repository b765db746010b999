#include "Shared/ServiceRegistry/Source/SRLProviderFromFunction.h"

#include <gtest/gtest.h>

#include <stdexcept>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "tests/support/TestReports.h"

namespace {

using rt::Ref;

class Clock final : public rt::Implements<Clock, rt::Object> {};

int calls = 0;
Ref<rt::Object> last;

Ref<rt::Object> makeClock() {
  ++calls;
  last = rt::make<Clock>();
  return last;
}

TEST(SRLProviderFromFunction, CallsTheFunctionAtEachGet) {
  calls = 0;
  const Ref<AVOProvider> provider = SRLProviderFromFunction(&makeClock);
  ASSERT_TRUE(provider);
  EXPECT_EQ(calls, 0);
  const Ref<rt::Object> first = provider->get();
  EXPECT_EQ(calls, 1);
  EXPECT_TRUE(first);
  EXPECT_EQ(first, last);
  const Ref<rt::Object> second = provider->get();
  EXPECT_EQ(calls, 2);
  EXPECT_EQ(second, last);
  EXPECT_NE(second, first);
  last = nullptr;
}

TEST(SRLProviderFromFunction, ReturnsNullIfTheFunctionDoes) {
  EXPECT_EQ(SRLProviderFromFunction([]() -> Ref<rt::Object> { return nullptr; })->get(), nullptr);
}

TEST(SRLProviderFromFunction, ThrowsWhatTheFunctionThrows) {
  const Ref<AVOProvider> provider =
      SRLProviderFromFunction([]() -> Ref<rt::Object> { throw std::out_of_range("no clock"); });
  EXPECT_THROW(provider->get(), std::out_of_range);
}

TEST(SRLProviderFromFunction, ReportsANullFunctionAndYieldsNull) {
  TestReports reports;
  EXPECT_EQ(SRLProviderFromFunction(nullptr), nullptr);
  const std::vector<Ref<LUMLogMessage>> messages = reports.messages();
  ASSERT_EQ(messages.size(), 1U);
  EXPECT_EQ(messages[0]->level(), LUMLogLevelFault);
  EXPECT_EQ(text(*messages[0]), "AVOProvider expects a block.");
  EXPECT_EQ(messages[0]->file(), "Shared/Async/Provider/AVOProvider");
  EXPECT_EQ(messages[0]->function(), "-[AVOProvider initWithBlock:]");
}

}  // namespace
