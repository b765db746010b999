#include "Runtime/Process/Thread.h"

#include <gtest/gtest.h>
#include <pthread.h>
#include <sys/resource.h>

#include <array>
#include <semaphore>
#include <thread>

#include "tests/support/AllocationCount.h"

namespace {

using namespace rt::literals;

template <class Body>
void onNewThread(Body body) {
  std::thread(body).join();
}

std::string systemName() {
  std::array<char, 64> name{};
  pthread_getname_np(pthread_self(), name.data(), name.size());
  return name.data();
}

TEST(Thread, HasNoNameUntilItIsNamed) {
  EXPECT_TRUE(rt::Thread::currentName().isNull());
  onNewThread([] { EXPECT_TRUE(rt::Thread::currentName().isNull()); });
}

TEST(Thread, HasTheNameThatItWasGiven) {
  onNewThread([] {
    rt::Thread::setCurrentName("Importer"_s);
    EXPECT_EQ(rt::Thread::currentName(), "Importer");
    EXPECT_EQ(systemName(), "Importer");
    rt::Thread::setCurrentName("Exporter"_s);
    EXPECT_EQ(rt::Thread::currentName(), "Exporter");
  });
  EXPECT_TRUE(rt::Thread::currentName().isNull());
}

TEST(Thread, DistinguishesAnEmptyNameFromNoName) {
  onNewThread([] {
    rt::Thread::setCurrentName(""_s);
    EXPECT_FALSE(rt::Thread::currentName().isNull());
    EXPECT_EQ(rt::Thread::currentName(), "");
  });
}

TEST(Thread, LosesItsNameWhenItIsSetToNull) {
  onNewThread([] {
    const std::string before = systemName();
    rt::Thread::setCurrentName("Importer"_s);
    rt::Thread::setCurrentName(nullptr);
    EXPECT_TRUE(rt::Thread::currentName().isNull());
    EXPECT_EQ(systemName(), before);
  });
}

// On Linux the main thread's name is the process's. Naming the main thread used to give other threads the
// process's former name.
TEST(Thread, HasNoNameAfterTheMainThreadIsNamed) {
  const std::string before = systemName();
  std::binary_semaphore isNamed(0);
  std::thread older([&] {
    isNamed.acquire();
    EXPECT_TRUE(rt::Thread::currentName().isNull());
  });
  rt::Thread::setCurrentName("Main"_s);
  isNamed.release();
  older.join();
  onNewThread([] { EXPECT_TRUE(rt::Thread::currentName().isNull()); });
  rt::Thread::setCurrentName(nullptr);
  EXPECT_TRUE(rt::Thread::currentName().isNull());
  EXPECT_EQ(systemName(), before);
}

TEST(Thread, LosesItsNameEvenIfNoFileCanBeOpened) {
#if defined(__has_feature)
#if __has_feature(undefined_behavior_sanitizer)
  GTEST_SKIP() << "the sanitizer looks at objects by way of descriptors";
#endif
#endif
  const std::string before = systemName();
  rlimit limit{};
  ASSERT_EQ(getrlimit(RLIMIT_NOFILE, &limit), 0);
  rlimit none = limit;
  none.rlim_cur = 0;
  onNewThread([&] {
    ASSERT_EQ(setrlimit(RLIMIT_NOFILE, &none), 0);
    rt::Thread::setCurrentName("Importer"_s);
    rt::Thread::setCurrentName(nullptr);
    const std::string after = systemName();
    setrlimit(RLIMIT_NOFILE, &limit);
    EXPECT_EQ(after, before);
  });
}

// A thread used to report its creator's name.
TEST(Thread, DoesNotInheritItsCreatorsName) {
  onNewThread([] {
    rt::Thread::setCurrentName("Importer"_s);
    onNewThread([] {
      EXPECT_TRUE(rt::Thread::currentName().isNull());
      rt::Thread::setCurrentName("Helper"_s);
      EXPECT_EQ(rt::Thread::currentName(), "Helper");
    });
    EXPECT_EQ(rt::Thread::currentName(), "Importer");
  });
}

#ifdef __APPLE__
TEST(Thread, HasTheNameThatTheSystemKnows) {
  onNewThread([] {
    pthread_setname_np("worker");
    EXPECT_EQ(rt::Thread::currentName(), "worker");
  });
}
#else
// On Linux the name that the system knows may be the creator's.
TEST(Thread, IgnoresTheNameThatTheSystemKnows) {
  onNewThread([] {
    pthread_setname_np(pthread_self(), "worker");
    EXPECT_TRUE(rt::Thread::currentName().isNull());
    onNewThread([] { EXPECT_TRUE(rt::Thread::currentName().isNull()); });
  });
}
#endif

TEST(Thread, KeepsALongNameAndShortensItForTheSystemBetweenCharacters) {
  onNewThread([] {
    // Bytes 15 and 16 form one character.
    const rt::String name = "abcdefghijklmn\xc3\xa9 and more"_s;
    rt::Thread::setCurrentName(name);
    EXPECT_EQ(rt::Thread::currentName(), name);
#ifndef __APPLE__
    EXPECT_EQ(systemName(), "abcdefghijklmn");
#endif
  });
}

TEST(Thread, ReturnsItsNameWithoutAllocating) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  onNewThread([] {
    rt::Thread::setCurrentName("Importer"_s);
    const AllocationCount count;
    const rt::String name = rt::Thread::currentName();
    EXPECT_EQ(count.allocations(), 0);
  });
}

TEST(Thread, HasAHandleOfItsOwn) {
  const void* const here = rt::Thread::currentHandle();
  EXPECT_NE(here, nullptr);
  EXPECT_EQ(rt::Thread::currentHandle(), here);
  onNewThread([&] { EXPECT_NE(rt::Thread::currentHandle(), here); });
}

}  // namespace
