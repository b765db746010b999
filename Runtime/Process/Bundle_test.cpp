#include "Runtime/Process/Bundle.h"

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <thread>

// Bundle_test is built with an identifier, Bundle_none_test without one.
#ifdef BUNDLE_IDENTIFIER
extern "C" const char kMainBundleIdentifier[];
extern "C" const char kMainBundleIdentifier[] = BUNDLE_IDENTIFIER;
#else
#define BUNDLE_IDENTIFIER ""
#endif

namespace {

using namespace rt::literals;

TEST(Bundle, HasTheIdentifierThatTheHostWasBuiltWith) {
  EXPECT_FALSE(rt::Bundle::mainIdentifier().isNull());
  EXPECT_EQ(rt::Bundle::mainIdentifier(), BUNDLE_IDENTIFIER);
}

TEST(Bundle, ReturnsTheIdentifierThatWasSet) {
  rt::Bundle::setMainIdentifier("com.example.Started"_s);
  EXPECT_EQ(rt::Bundle::mainIdentifier(), "com.example.Started");
  rt::Bundle::setMainIdentifier(""_s);
  EXPECT_EQ(rt::Bundle::mainIdentifier(), "");
  rt::Bundle::setMainIdentifier(nullptr);
  EXPECT_EQ(rt::Bundle::mainIdentifier(), BUNDLE_IDENTIFIER);
}

// Every result is one of the identifiers that were set.
TEST(Bundle, IsReadAndSetByThreadsAtTheSameTime) {
  const auto first = rt::String::fromUTF8("com.example.First");
  const auto second = rt::String::fromUTF8("com.example.Second");
  rt::Bundle::setMainIdentifier(first);
  std::thread setter([&] {
    for (int i = 0; i < 2000; ++i) rt::Bundle::setMainIdentifier(i % 2 == 0 ? second : first);
  });
  for (int i = 0; i < 2000; ++i) {
    const rt::String identifier = rt::Bundle::mainIdentifier();
    ASSERT_TRUE(identifier == first || identifier == second);
  }
  setter.join();
  rt::Bundle::setMainIdentifier(nullptr);
}

// The child used to wait for ever if another thread of the parent was setting the identifier.
TEST(Bundle, HasItsIdentifierInTheChildOfAFork) {
  const auto identifier = rt::String::fromUTF8("com.example.Forked");
  std::atomic<bool> isEnding = false;
  std::thread setter([&] {
    while (!isEnding) rt::Bundle::setMainIdentifier(identifier);
  });
  rt::Bundle::setMainIdentifier(identifier);
  for (int i = 0; i < 100; ++i) {
    const pid_t child = fork();
    if (child == 0) _exit(rt::Bundle::mainIdentifier() == identifier ? 0 : 1);
    int status = -1;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0);
  }
  isEnding = true;
  setter.join();
  rt::Bundle::setMainIdentifier(nullptr);
}

}  // namespace
