// Tests the parts of the runtime when allocations fail.

#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <new>
#include <string>
#include <thread>
#include <vector>

#include "Runtime/Defaults/UserDefaults.h"
#include "Runtime/Objects/Exception.h"
#include "Runtime/Objects/Weak.h"
#include "Runtime/Process/AssertionHandler.h"
#include "Runtime/Process/FileHandle.h"
#include "Runtime/Process/Private/CallStack.h"
#include "Runtime/Process/Thread.h"
#include "Runtime/Queues/Queue.h"
#include "Runtime/Text/Format.h"
#include "Runtime/Text/Private/LocalTimeFormatter.h"
#include "Runtime/Values/Dictionary.h"
#include "Runtime/Values/Number.h"
#include "Runtime/Values/Set.h"
#include "tests/support/AllocationFailure.h"
#include "tests/support/KeyedArchiverTest.h"
#include "tests/support/Sanitizers.h"
#include "tests/support/SettingsFile.h"
#include "tests/support/WithoutMemory.h"

namespace {

using namespace rt::literals;
using rt::Ref;
using WithoutMemory::onNewThread;
using WithoutMemory::tryEachAllocation;

constexpr const char* kLong =
    "a text that is too long to be kept in a string of the language's library itself";

// A folder that a test and its children share.
class Folder {
 public:
  Folder() {
    // The folder is in memory if possible, because syncing a file to a disk is slow.
    const std::string parent = std::filesystem::is_directory("/dev/shm") ? "/dev/shm/" : testing::TempDir();
    std::string name = parent + "without-memory.XXXXXX";
    if (mkdtemp(name.data()) == nullptr) throw std::runtime_error("no temporary folder");
    path_ = name;
  }
  Folder(const Folder&) = delete;
  Folder& operator=(const Folder&) = delete;
  ~Folder() { std::filesystem::remove_all(path_); }

  std::string at(const char* name) const { return path_ / name; }

 private:
  std::filesystem::path path_;
};

// Returns the number that the next new descriptor would have.
int nextDescriptor() {
  const int next = dup(STDIN_FILENO);
  close(next);
  return next;
}

TEST(WithoutMemory, Formats) {
  tryEachAllocation([] {
    rt::Dictionary::Builder entries;
    entries.set("key"_s, rt::Number::of(7));
    const Ref<rt::Array> list = rt::Array::of(rt::String::fromUTF8(kLong), rt::Number::of(-1.5),
                                              std::move(entries).dictionary(), rt::Set::of("one"_s));
    const rt::String text = rt::format("%@ %s %lu %5.2f %p %@"_s, "short"_s, kLong, 42UL, 0.125,
                                       static_cast<const void*>(nullptr), list);
    EXPECT_TRUE(text.view().starts_with("short a text that is too long"));
    EXPECT_NE(text.view().find('7'), std::string_view::npos);
    EXPECT_TRUE(text.uppercased().view().starts_with("SHORT"));
    EXPECT_EQ(rt::String::fromUTF8Repaired("\xFFx").view(), "\uFFFDx");
  });
}

TEST(WithoutMemory, FormatsTimes) {
  tryEachAllocation([] {
    const Ref<rt::LocalTimeFormatter> formatter =
        rt::LocalTimeFormatter::initWithPattern("yyyy-MM-dd'T'HH:mm:ss.SSS"_s);
    ASSERT_TRUE(formatter);
    EXPECT_EQ(formatter->stringFromTime(std::chrono::system_clock::time_point()).view().substr(4, 1), "-");
  });
}

TEST(WithoutMemory, TakesWeakReferences) {
  tryEachAllocation([] {
    Ref<Plain> object = rt::make<Plain>();
    const rt::Weak<Plain> weak = object;
    EXPECT_EQ(weak.lock(), object);
    object = nullptr;
    EXPECT_EQ(weak.lock(), nullptr);
  });
}

// If there was no memory to copy a property list, the program used to jump to an invalid address.
TEST(WithoutMemory, ArchivesAndUnarchives) {
  tryEachAllocation([] {
    const Ref<Tag> tag = rt::make<Tag>("shared"_s);
    rt::Dictionary::Builder entries;
    entries.set("key"_s, rt::Number::of(std::int64_t{1} << 40));
    const Ref<rt::Array> list =
        rt::Array::of(tag, rt::make<Tag>(rt::String::fromUTF8(kLong), tag), rt::Number::of(0.5),
                      std::move(entries).dictionary(), rt::Array::of(rt::Number::of(true), ""_s));
    rt::KeyedArchiver archiver;
    archiver.encodeObject(list, "first");
    const std::vector<std::byte> part = archiver.encodedData();
    archiver.encodeObject(rt::make<ColoredTag>("more"_s), "second");
    const std::vector<std::byte> whole = archiver.encodedData();
    EXPECT_GT(whole.size(), part.size());

    rt::KeyedUnarchiver unarchiver(whole);
    EXPECT_TRUE(rt::isEqual(unarchiver.decodeObjectOfClasses(kAll, "first"), list));
    EXPECT_TRUE(unarchiver.decodeObjectOfClass<ColoredTag>("second"));
    EXPECT_TRUE(unarchiver.error().isNull());
    rt::String error;
    EXPECT_FALSE(rt::KeyedUnarchiver::unarchivedObjectOfClasses(kAll, {}, &error));
    EXPECT_FALSE(error.isNull());
  });
}

std::atomic<int> tasksRun = 0;

TEST(WithoutMemory, RunsQueuedTasks) {
  tryEachAllocation([] {
    tasksRun = 0;
    const Ref<rt::Queue> queue = rt::make<rt::Queue>("Tasks"_s);
    const Ref<rt::Queue> other = rt::make<rt::Queue>("Other tasks"_s);
    int queued = 0;
    try {
      for (; queued < 3; ++queued) (queued == 1 ? other : queue)->async([] { ++tasksRun; });
    } catch (const std::bad_alloc&) {
      queue->barrierSync();
      other->barrierSync();
      EXPECT_EQ(tasksRun, queued);
      throw;
    }
    EXPECT_EQ(queue->sync([] { return 7; }), 7);
    other->barrierSync();
    EXPECT_EQ(tasksRun, 3);
  });
}

// This used to end the program: the C library does so if it has no memory to register a destructor.
TEST(WithoutMemory, NamesThreads) {
  tryEachAllocation([] {
    onNewThread([] {
      EXPECT_TRUE(rt::Thread::currentName().isNull());
      try {
        rt::Thread::setCurrentName("Importer"_s);
      } catch (const std::bad_alloc&) {
        EXPECT_TRUE(rt::Thread::currentName().isNull());
        throw;
      }
      EXPECT_EQ(rt::Thread::currentName(), "Importer");
      rt::Thread::setCurrentName(rt::String::fromUTF8("Exporter"));
      EXPECT_EQ(rt::Thread::currentName(), "Exporter");
    });
  });
}

TEST(WithoutMemory, HandlesFailedAssertions) {
  tryEachAllocation([] {
    onNewThread([] {
      const Ref<rt::AssertionHandler> own = rt::make<rt::AssertionHandler>();
      rt::AssertionHandler::setCurrentHandler(own);
      EXPECT_EQ(rt::AssertionHandler::currentHandler(), own);
    });
    try {
      throw rt::Exception("Name"_s, rt::String::fromUTF8(kLong));
    } catch (const rt::Exception& exception) {
      EXPECT_EQ(exception.reason().view(), kLong);
    }
  });
}

// A failed allocation used to leave the descriptor open.
TEST(WithoutMemory, WritesFiles) {
  const Folder folder;
  const std::string path = folder.at("log");
  tryEachAllocation([&] {
    const int before = nextDescriptor();
    try {
      const Ref<rt::FileHandle> handle =
          rt::FileHandle::openForAppending(rt::String::fromUTF8(path.c_str()), 0600);
      ASSERT_TRUE(handle);
      handle->writeLine(kLong);
      EXPECT_TRUE(rt::FileHandle::standardError());
    } catch (const std::bad_alloc&) {
      EXPECT_EQ(nextDescriptor(), before);
      throw;
    }
    EXPECT_EQ(nextDescriptor(), before);
  });
}

TEST(WithoutMemory, DescribesCallStacks) {
  tryEachAllocation([] {
    std::array<std::uint64_t, 64> addresses{};
    std::size_t count = std::min<std::size_t>(rt::CallStack::capture(addresses), 2);
    if (RT_TEST_ADDRESS_SANITIZER || RT_TEST_THREAD_SANITIZER) {
      // Instrumented programs have so many symbols that reading them again and again takes minutes.
      addresses[0] = reinterpret_cast<std::uint64_t>(&std::getenv);
      count = 1;
    }
    const int before = nextDescriptor();
    try {
      const std::vector<rt::String> lines = rt::CallStack::symbols(std::span(addresses).first(count));
      EXPECT_EQ(lines.size(), count);
    } catch (const std::bad_alloc&) {
      EXPECT_EQ(nextDescriptor(), before);
      throw;
    }
    EXPECT_EQ(nextDescriptor(), before);
  });
}

TEST(WithoutMemory, ReadsAndObservesDefaults) {
  const Folder folder;
  const std::string path = folder.at("defaults.conf");
  std::ofstream(path) << "kept = " << kLong << "\n";
  // Drops the reports that the file cannot be watched.
  rt::UserDefaults::setReportHandler([](const rt::String&) {});
  tryEachAllocation([&] {
    int calls = 0;
    const Ref<rt::UserDefaults> defaults = rt::UserDefaults::initWithPath(rt::String::fromUTF8(path.c_str()));
    EXPECT_EQ(defaults->stringForKey("kept").view(), kLong);
    const rt::UserDefaults::Observation observation =
        defaults->observe("key", rt::UserDefaults::Notify::kAlsoNow, [&] { ++calls; });
    EXPECT_EQ(calls, 1);
    EXPECT_EQ(defaults->stringForKey("kept").view(), kLong);
  });
}

// An observer for which there was no memory used never to be called again, and the thread that waits for
// changes to end the program.
TEST(WithoutMemory, TellsObserversOfDefaultsAsSoonAsThereIsSome) {
  if (!AllocationFailure::isSupported()) GTEST_SKIP() << "allocations cannot be made to fail";
  const Folder folder;
  SettingsFile settings(folder.at("defaults.conf"));
  rt::UserDefaults::setReportHandler([](const rt::String&) {});
  const Ref<rt::UserDefaults> defaults =
      rt::UserDefaults::initWithPath(rt::String::fromUTF8(folder.at("defaults.conf").c_str()));
  std::atomic<int> changesSeen = 0;
  const rt::UserDefaults::Observation observation =
      defaults->observe("key", rt::UserDefaults::Notify::kOnChange, [&] { ++changesSeen; });
  int failures = 0;
  // Each costs a second, after which the thread tries again.
  for (const int number : {1, 2, 4, 8}) {
    const AllocationFailure failure(number);
    const AllocationFailure::Pause pause;
    const int before = changesSeen;
    settings.set("key", std::to_string(number) + kLong);
    while (changesSeen == before) std::this_thread::yield();
    if (failure.hasHappened()) ++failures;
  }
  EXPECT_GE(failures, 1);
}

}  // namespace
