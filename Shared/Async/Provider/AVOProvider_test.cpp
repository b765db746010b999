#include "Shared/Async/Provider/AVOProvider.h"

#include <gtest/gtest.h>

#include <stdexcept>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Weak.h"
#include "tests/support/TestReports.h"

namespace {

using rt::Ref;

class Clock final : public rt::Implements<Clock, rt::Object> {};

TEST(AVOProvider, CallsItsBlockAtEachGet) {
  for (const auto make : {&AVOProvider::providerWithBlock, &AVOProvider::initWithBlock}) {
    int calls = 0;
    Ref<rt::Object> made;
    const Ref<AVOProvider> provider = make([&] {
      ++calls;
      made = rt::make<Clock>();
      return made;
    });
    ASSERT_TRUE(provider);
    EXPECT_EQ(calls, 0);
    const Ref<rt::Object> first = provider->get();
    EXPECT_EQ(calls, 1);
    EXPECT_TRUE(first);
    EXPECT_EQ(first, made);
    const Ref<rt::Object> second = provider->get();
    EXPECT_EQ(calls, 2);
    EXPECT_EQ(second, made);
    EXPECT_NE(second, first);
  }
}

TEST(AVOProvider, IsANewObjectEachTime) {
  const AVOProvider::ProviderBlock block = []() -> Ref<rt::Object> { return nullptr; };
  EXPECT_NE(AVOProvider::providerWithBlock(block), AVOProvider::providerWithBlock(block));
}

TEST(AVOProvider, ReturnsNullIfItsBlockDoes) {
  EXPECT_EQ(AVOProvider::providerWithBlock([] { return nullptr; })->get(), nullptr);
}

TEST(AVOProvider, ThrowsWhatItsBlockThrows) {
  const Ref<AVOProvider> provider =
      AVOProvider::providerWithBlock([]() -> Ref<rt::Object> { throw std::out_of_range("no clock"); });
  EXPECT_THROW(provider->get(), std::out_of_range);
  EXPECT_THROW(provider->get(), std::out_of_range);
}

TEST(AVOProvider, OwnsItsBlock) {
  Ref<Clock> clock = rt::make<Clock>();
  const rt::Weak<Clock> weak = clock;
  Ref<AVOProvider> provider =
      AVOProvider::providerWithBlock([clock = std::move(clock)]() -> Ref<rt::Object> { return clock; });
  EXPECT_NE(weak.lock(), nullptr);
  EXPECT_EQ(provider->get(), weak.lock());
  provider = nullptr;
  EXPECT_EQ(weak.lock(), nullptr);
}

TEST(AVOProvider, RetainsItsObjectAndReturnsItAtEachGet) {
  Ref<Clock> clock = rt::make<Clock>();
  const rt::Weak<Clock> weak = clock;
  Ref<AVOProvider> provider = AVOProvider::providerWithObject(clock);
  EXPECT_EQ(provider->get(), clock);
  clock = nullptr;
  EXPECT_NE(weak.lock(), nullptr);
  EXPECT_EQ(provider->get(), weak.lock());
  EXPECT_EQ(provider->get(), weak.lock());
  provider = nullptr;
  EXPECT_EQ(weak.lock(), nullptr);
}

TEST(AVOProvider, AcceptsANullObject) {
  TestReports reports;
  const Ref<AVOProvider> provider = AVOProvider::providerWithObject(nullptr);
  ASSERT_TRUE(provider);
  EXPECT_EQ(provider->get(), nullptr);
  EXPECT_TRUE(reports.messages().empty());
}

TEST(AVOProvider, ReturnsNullWithoutABlock) {
  TestReports reports;
  const Ref<AVOProvider> provider = AVOProvider::init();
  ASSERT_TRUE(provider);
  EXPECT_EQ(provider->get(), nullptr);
  EXPECT_TRUE(reports.messages().empty());
}

TEST(AVOProvider, ReportsANullBlockAndYieldsNull) {
  TestReports reports;
  for (const auto make : {&AVOProvider::providerWithBlock, &AVOProvider::initWithBlock}) {
    EXPECT_EQ(make(nullptr), nullptr);
    const std::vector<Ref<LUMLogMessage>> messages = reports.messages();
    ASSERT_EQ(messages.size(), 1U);
    EXPECT_EQ(messages[0]->level(), LUMLogLevelFault);
    EXPECT_EQ(text(*messages[0]), "AVOProvider expects a block.");
    EXPECT_EQ(messages[0]->file(), "Shared/Async/Provider/AVOProvider");
    EXPECT_EQ(messages[0]->function(), "-[AVOProvider initWithBlock:]");
    EXPECT_GT(messages[0]->line(), 0U);
    EXPECT_FALSE(messages[0]->safeParameters());
  }
}

}  // namespace
