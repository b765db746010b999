// Changes by other processes, and user defaults in the child of a fork.

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <csignal>
#include <filesystem>
#include <functional>
#include <semaphore>
#include <stdexcept>
#include <string>
#include <string_view>
#include <system_error>
#include <thread>
#include <utility>
#include <vector>

#include "Runtime/Objects/Weak.h"
#include "tests/support/ForkTest.h"
#include "tests/support/Process.h"
#include "tests/support/Sanitizers.h"
#include "tests/support/UserDefaultsTest.h"

namespace {

namespace fs = std::filesystem;
using namespace rt::literals;
using Notify = rt::UserDefaults::Notify;
using testing::ElementsAre;
using testing::HasSubstr;

// Runs `script` in another process. In the script, $1 is `path`.
void inShell(const std::string& script, const fs::path& path) {
  const ProcessResult result = runProcess({"sh", "-ec", script, "sh", path.string()});
  ASSERT_EQ(result.exitStatus, 0) << result.standardError;
}

using UserDefaultsOfOthers = UserDefaults;

TEST_F(UserDefaultsOfOthers, NotifyObserversOfChanges) {
  const auto defaults = this->defaults();
  const auto observation = observe(defaults);
  await(nullptr);
  inShell(R"(echo 'key = 1' > "$1")", path());
  await("1"_s);
  inShell(R"(echo 'key = 2' > "$1")", path());
  await("2"_s);
  inShell(R"(echo 'key = 3' > "$1.new"; mv "$1.new" "$1")", path());
  await("3"_s);
  inShell(R"(rm "$1")", path());
  await(nullptr);
  inShell(R"(echo 'key = 4' > "$1"; echo 'not key' > "$1"; echo 'key = 5' > "$1")", path());
  await("5"_s);
}

TEST_F(UserDefaultsOfOthers, NotifyObserversEvenIfAReadCameFirst) {
  const auto defaults = this->defaults();
  const auto observation = observe(defaults);
  for (int i = 0; i < 100; ++i) {
    const std::string value = std::to_string(i);
    write(path(), "key = " + value);
    ASSERT_EQ(defaults->stringForKey("key"), std::string_view(value));
    await(rt::String::fromUTF8(value));
  }
}

// On macOS, each watched file needs a descriptor. Each change used to leave one open.
TEST_F(UserDefaultsOfOthers, KeepNoDescriptorOpenForAnEarlierChange) {
  constexpr int kChanges = 40;
  const auto firstFreeDescriptor = [] {
    const int descriptor = open("/dev/null", O_RDONLY | O_CLOEXEC);
    close(descriptor);
    return descriptor;
  };
  const auto defaults = this->defaults();
  const auto observation = observe(defaults);
  const int before = firstFreeDescriptor();
  for (int i = 0; i < kChanges; ++i) {
    const std::string value = std::to_string(i);
    write(path(), "key = " + value);
    await(rt::String::fromUTF8(value));
  }
  // The thread that watches may be at work.
  EXPECT_LT(firstFreeDescriptor(), before + kChanges / 2);
}

TEST_F(UserDefaultsOfOthers, NotifyObserversEvenIfTheFolderWasMissing) {
  const fs::path path = folder_ / "a" / "b" / "c" / "defaults.conf";
  const auto defaults = defaultsAt(path);
  const auto observation = observe(defaults);
  inShell(R"(mkdir -p "${1%/*}"; echo 'key = 1' > "$1")", path);
  await("1"_s);
  inShell(R"(rm -r "${1%/b/*}/b")", path);
  await(nullptr);
  inShell(R"(mkdir -p "${1%/*}")", path);
  inShell(R"(echo 'key = 2' > "$1")", path);
  await("2"_s);
}

TEST_F(UserDefaultsOfOthers, NotifyObserversThroughASymbolicLink) {
  fs::create_directory(folder_ / "elsewhere");
  fs::create_symlink("elsewhere/target", path());
  write(folder_ / "elsewhere" / "target", "key = 1");
  const auto defaults = this->defaults();
  const auto observation = observe(defaults);
  await("1"_s);
  inShell(R"(echo 'key = 2' > "${1%/*}/elsewhere/target")", path());
  await("2"_s);
  inShell(R"(mkdir "${1%/*}/third"; echo 'key = 3' > "${1%/*}/third/target"; ln -snf third/target "$1")",
          path());
  await("3"_s);
  inShell(R"(echo 'key = 4' > "${1%/*}/third/target")", path());
  await("4"_s);
}

TEST_F(UserDefaultsOfOthers, NotifyObserversAfterAFork) {
  auto defaults = this->defaults();
  auto observation = observe(defaults);
  const pid_t child = fork();
  if (child == 0) {
    // Ends the observation in the child only.
    observation = {};
    defaults = nullptr;
    _exit(0);
  }
  int status = 0;
  ASSERT_EQ(waitpid(child, &status, 0), child);
  ASSERT_EQ(status, 0);
  inShell(R"(echo 'key = 1' > "$1")", path());
  await("1"_s);
}

TEST_F(UserDefaultsOfOthers, NotifyObserversOnAThreadThatBlocksSignals) {
  const auto defaults = this->defaults();
  std::binary_semaphore called{0};
  sigset_t blocked;
  sigemptyset(&blocked);
  std::thread::id thread;
  const auto observation = defaults->observe("key", Notify::kOnChange, [&] {
    pthread_sigmask(SIG_SETMASK, nullptr, &blocked);
    thread = std::this_thread::get_id();
    called.release();
  });
  inShell(R"(echo 'key = 1' > "$1")", path());
  called.acquire();
  EXPECT_NE(thread, std::this_thread::get_id());
  EXPECT_EQ(sigismember(&blocked, SIGTERM), 1);
  sigset_t own;
  pthread_sigmask(SIG_SETMASK, nullptr, &own);
  EXPECT_EQ(sigismember(&own, SIGTERM), 0);
}

TEST_F(UserDefaultsOfOthers, ReportExceptionsOfObservers) {
  const auto defaults = this->defaults();
  std::binary_semaphore reported{0};
  std::string report;
  rt::UserDefaults::setReportHandler([&](const rt::String& line) {
    report = line.view();
    reported.release();
  });
  const auto first = defaults->observe("key", Notify::kOnChange, [isFirst = true]() mutable {
    if (std::exchange(isFirst, false)) throw std::runtime_error("oh");
    throw 1;
  });
  const auto second = observe(defaults);
  inShell(R"(echo 'key = 1' > "$1")", path());
  reported.acquire();
  EXPECT_EQ(report, "an observer of user defaults threw: oh");
  await("1"_s);
  inShell(R"(echo 'key = 2' > "$1")", path());
  reported.acquire();
  EXPECT_EQ(report, "an observer of user defaults threw: an exception of an unknown type");
  await("2"_s);
  rt::UserDefaults::setReportHandler(nullptr);
}

// An observer may release the last reference, on the thread that the removal would otherwise wait for.
TEST_F(UserDefaultsOfOthers, MayBeReleasedByAnObserver) {
  auto defaults = this->defaults();
  const rt::Weak<rt::UserDefaults> weak = defaults;
  std::binary_semaphore kept{0};
  std::binary_semaphore called{0};
  rt::UserDefaults::Observation observation;
  observation = defaults->observe("key", Notify::kOnChange, [&] {
    kept.acquire();
    observation = {};
    called.release();
  });
  kept.release();
  defaults = nullptr;
  inShell(R"(echo 'key = 1' > "$1")", path());
  called.acquire();
  EXPECT_FALSE(weak.lock());
}

// Runs `inChild` in the child of a fork and returns its status. The child is killed after a minute.
int statusOfFork(const std::function<int()>& inChild) {
  const pid_t child = fork();
  if (child == 0) {
    alarm(60);
    _exit(inChild());
  }
  int status = -1;
  waitpid(child, &status, 0);
  return status;
}

// Regression: the child waited for ever for a call that a thread of the parent was making.
TEST_F(UserDefaults, DoNotWaitInAChildForAThreadOfTheParent) {
  const auto defaults = this->defaults();
  std::binary_semaphore isCalled{0};
  std::binary_semaphore mayReturn{0};
  auto observation = defaults->observe("key", Notify::kOnChange, [&] {
    isCalled.release();
    mayReturn.acquire();
  });
  set("key", "1");
  isCalled.acquire();
  EXPECT_EQ(statusOfFork([&] {
              observation.remove();
              return defaults->stringForKey("key") == "1" ? 0 : 1;
            }),
            0);
  mayReturn.release();
  observation.remove();
}

// Regression: if a thread of the parent was calling an observer, the child never called that observer.
TEST_F(UserDefaults, InAChildAreObservedAgain) {
  if (RT_TEST_THREAD_SANITIZER) GTEST_SKIP() << "the thread sanitizer allows no thread in such a child";
  const auto defaults = this->defaults();
  std::binary_semaphore isCalled{0};
  std::binary_semaphore mayReturn{0};
  std::binary_semaphore isCalledInChild{0};
  const pid_t parent = getpid();
  auto observation = defaults->observe("key", Notify::kOnChange, [&] {
    if (getpid() != parent) {
      isCalledInChild.release();
    } else if (defaults->stringForKey("key") == "1") {
      isCalled.release();
      mayReturn.acquire();
    }
  });
  set("key", "1");
  isCalled.acquire();
  EXPECT_EQ(statusOfFork([&] {
              // Starts a thread that watches, which calls the parent's observer as well.
              const auto another = defaults->observe("other", Notify::kOnChange, [] {});
              set("key", "2");
              isCalledInChild.acquire();
              return 0;
            }),
            0);
  mayReturn.release();
  observation.remove();
}

// Regression: in the child, the thread waited for itself for ever.
TEST_F(UserDefaults, AllowAForkInAnObserver) {
  const auto defaults = this->defaults();
  int status = -1;
  std::counting_semaphore<> isOver{0};
  rt::UserDefaults::Observation observation;
  observation = defaults->observe("key", Notify::kOnChange, [&] {
    status = statusOfFork([&] {
      observation.remove();
      // Not by `set`, whose lock the parent's main thread may hold.
      write(folder_ / "fresh", "key = 2");
      fs::rename(folder_ / "fresh", path());
      return defaults->stringForKey("key") == "2" ? 0 : 1;
    });
    isOver.release();
  });
  set("key", "1");
  isOver.acquire();
  observation.remove();
  EXPECT_EQ(status, 0);
}

// Invariant: a child reads and observes, whatever the threads of its parent were doing.
TEST_F(UserDefaults, AreUsableInAChildWhateverTheParentsThreadsHeld) {
  if (RT_TEST_THREAD_SANITIZER) GTEST_SKIP() << "the thread sanitizer allows no thread in such a child";
  const auto defaults = this->defaults();
  set("key", "0");
  std::atomic<int> calls = 0;
  const auto observation = defaults->observe("key", Notify::kOnChange, [&] { ++calls; });
  std::atomic<bool> isEnding = false;
  std::vector<std::thread> threads;
  threads.emplace_back([&] {
    for (int i = 0; !isEnding; ++i) set("key", std::to_string(i));
  });
  threads.emplace_back([&] {
    while (!isEnding) defaults->stringForKey("key");
  });
  for (int i = 0; i < 30; ++i) {
    EXPECT_EQ(statusOfFork([&] {
                std::atomic<int> callsInChild = 0;
                const auto inChild = defaults->observe("key", Notify::kAlsoNow, [&] { ++callsInChild; });
                return callsInChild >= 1 && !defaults->stringForKey("key").isNull() ? 0 : 1;
              }),
              0);
  }
  isEnding = true;
  for (std::thread& thread : threads) thread.join();
}

// Regression: once the system had refused to watch the file, it was never watched again.
TEST_F(UserDefaultsOfOthers, NotifyObserversAgainAfterASystemFailure) {
  if (RT_TEST_IS_APPLE) GTEST_SKIP() << "only Linux shows which descriptor watches";
  const auto defaults = this->defaults();
  const auto observation = observe(defaults);
  int replaced = 0;
  const int nothing = open("/dev/null", O_RDONLY | O_CLOEXEC);
  for (const fs::directory_entry& entry : fs::directory_iterator("/proc/self/fd")) {
    std::error_code error;
    if (fs::read_symlink(entry.path(), error) != "anon_inode:inotify") continue;
    const int descriptor = std::stoi(entry.path().filename());
    ASSERT_EQ(dup2(nothing, descriptor), descriptor);
    fcntl(descriptor, F_SETFD, FD_CLOEXEC);
    ++replaced;
  }
  close(nothing);
  ASSERT_GT(replaced, 0) << "the file is not watched";
  // One of these changes wakes the thread, which then finds that it cannot watch.
  inShell(R"(echo 'key = 1' > "$1")", path());
  await("1"_s);
  inShell(R"(echo 'key = 2' > "$1")", path());
  await("2"_s);
  EXPECT_THAT(reports(), ElementsAre(HasSubstr("user defaults are not watched for changes until the system "
                                               "allows it again: ")));
}

}  // namespace
