#include "Runtime/Process/FileHandle.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <map>
#include <sstream>
#include <string>
#include <system_error>
#include <thread>
#include <vector>

#include "tests/support/AllocationCount.h"

namespace {

using namespace rt::literals;
namespace fs = std::filesystem;

class FileHandleTest : public testing::Test {
 protected:
  FileHandleTest() {
    std::string path = testing::TempDir() + "/FileHandle_test.XXXXXX";
    if (mkdtemp(path.data()) != nullptr) directory_ = path;
  }
  ~FileHandleTest() override { fs::remove_all(directory_); }

  fs::path path(const char* name = "log") const { return directory_ / name; }
  rt::Ref<rt::FileHandle> open(std::uint16_t mode = 0644) const {
    return rt::FileHandle::openForAppending(rt::String::fromUTF8(path().c_str()), mode);
  }

  static std::string contents(const fs::path& path) {
    std::ostringstream text;
    text << std::ifstream(path).rdbuf();
    return text.str();
  }

 private:
  fs::path directory_;
};

int errorOf(rt::FileHandle& handle, std::string_view line) {
  try {
    handle.writeLine(line);
  } catch (const std::system_error& error) {
    return error.code().value();
  }
  return 0;
}

TEST_F(FileHandleTest, MakesTheFileWithTheModeLessTheUmask) {
  const mode_t before = umask(022);
  const rt::Ref<rt::FileHandle> handle = open(0666);
  umask(before);
  ASSERT_TRUE(handle);
  struct stat status{};
  ASSERT_EQ(stat(path().c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777U, 0644U);
  EXPECT_EQ(contents(path()), "");
}

TEST_F(FileHandleTest, WritesLinesAtTheEnd) {
  std::ofstream(path()) << "before\n";
  {
    const rt::Ref<rt::FileHandle> handle = open();
    ASSERT_TRUE(handle);
    handle->writeLine("one");
    handle->writeLine("");
    handle->writeLine(std::string_view("t\0o\n", 4));
  }
  EXPECT_EQ(contents(path()), std::string("before\none\n\nt\0o\n\n", 17));
}

TEST_F(FileHandleTest, WritesALineOfAnyLength) {
  const std::string line(3'000'000, 'x');
  open()->writeLine(line);
  EXPECT_EQ(contents(path()), line + "\n");
}

// A short line is joined with its line feed before it is written. A long one is written in two pieces.
TEST_F(FileHandleTest, WritesLinesAroundTheLengthUpToWhichPiecesAreJoined) {
  const rt::Ref<rt::FileHandle> handle = open();
  std::string expected;
  for (std::size_t length = 1000; length < 1050; ++length) {
    const std::string line(length, static_cast<char>('a' + (length % 26)));
    handle->writeLine(line);
    expected += line + "\n";
  }
  EXPECT_EQ(contents(path()), expected);
}

TEST_F(FileHandleTest, ClosesItsDescriptorWhenItIsReleased) {
  rt::Ref<rt::FileHandle> handle = open();
  ASSERT_TRUE(handle);
  const int descriptor = handle->descriptor();
  EXPECT_EQ(fcntl(descriptor, F_GETFD), FD_CLOEXEC);
  handle = nullptr;
  EXPECT_EQ(fcntl(descriptor, F_GETFD), -1);
}

TEST_F(FileHandleTest, LeavesTheStandardStreamsOpen) {
  EXPECT_EQ(rt::FileHandle::standardOutput(), rt::FileHandle::standardOutput());
  EXPECT_EQ(rt::FileHandle::standardOutput()->descriptor(), STDOUT_FILENO);
  EXPECT_EQ(rt::FileHandle::standardError()->descriptor(), STDERR_FILENO);
  testing::internal::CaptureStdout();
  rt::FileHandle::standardOutput()->writeLine("to standard output");
  EXPECT_EQ(testing::internal::GetCapturedStdout(), "to standard output\n");
  testing::internal::CaptureStderr();
  rt::FileHandle::standardError()->writeLine("to standard error");
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "to standard error\n");
}

TEST_F(FileHandleTest, ReturnsNullIfTheFileCannotBeOpened) {
  errno = 0;
  EXPECT_FALSE(rt::FileHandle::openForAppending(rt::String::fromUTF8(path("no/file").c_str()), 0644));
  EXPECT_EQ(errno, ENOENT);
  fs::create_directory(path("directory"));
  EXPECT_FALSE(rt::FileHandle::openForAppending(rt::String::fromUTF8(path("directory").c_str()), 0644));
  EXPECT_EQ(errno, EISDIR);
  EXPECT_FALSE(rt::FileHandle::openForAppending(""_s, 0644));
  EXPECT_EQ(errno, ENOENT);
}

TEST_F(FileHandleTest, ReturnsNullForANullPath) {
  errno = 0;
  EXPECT_FALSE(rt::FileHandle::openForAppending(nullptr, 0644));
  EXPECT_EQ(errno, EINVAL);
}

TEST_F(FileHandleTest, ReturnsNullForAPathThatContainsNul) {
  const std::string name = path().string() + std::string("\0more", 5);
  errno = 0;
  EXPECT_FALSE(rt::FileHandle::openForAppending(rt::String::fromUTF8(std::string_view(name)), 0644));
  EXPECT_EQ(errno, EINVAL);
  EXPECT_FALSE(fs::exists(path()));
}

TEST_F(FileHandleTest, ThrowsIfTheDeviceIsFull) {
  if (!fs::exists("/dev/full")) GTEST_SKIP() << "no /dev/full here";
  const rt::Ref<rt::FileHandle> handle = rt::FileHandle::openForAppending("/dev/full"_s, 0644);
  ASSERT_TRUE(handle);
  EXPECT_EQ(errorOf(*handle, "line"), ENOSPC);
  EXPECT_EQ(errorOf(*handle, "line"), ENOSPC);
}

TEST_F(FileHandleTest, ThrowsIfTheDescriptorIsClosed) {
  const rt::Ref<rt::FileHandle> handle = open();
  close(handle->descriptor());
  EXPECT_EQ(errorOf(*handle, "line"), EBADF);
  // The handle's destructor closes this descriptor, so it must be open again.
  ASSERT_EQ(dup2(STDERR_FILENO, handle->descriptor()), handle->descriptor());
}

TEST_F(FileHandleTest, KeepsWritingToAFileThatWasRemoved) {
  const rt::Ref<rt::FileHandle> handle = open();
  fs::remove(path());
  EXPECT_EQ(errorOf(*handle, "line"), 0);
  EXPECT_FALSE(fs::exists(path()));
}

// A line that the system took in part stays incomplete. Later lines are complete.
TEST_F(FileHandleTest, StartsANewLineAfterAnIncompleteOne) {
  const rt::Ref<rt::FileHandle> handle = open();
  rlimit before{};
  ASSERT_EQ(getrlimit(RLIMIT_FSIZE, &before), 0);
  const auto handler = std::signal(SIGXFSZ, SIG_IGN);
  rlimit limit = before;
  limit.rlim_cur = 10;
  ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &limit), 0);
  EXPECT_EQ(errorOf(*handle, "0123456789abcdef"), EFBIG);
  EXPECT_EQ(errorOf(*handle, "lost"), EFBIG);
  ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &before), 0);
  std::signal(SIGXFSZ, handler);
  handle->writeLine("next");
  handle->writeLine("last");
  EXPECT_EQ(contents(path()), "0123456789\nnext\nlast\n");
}

// An empty line used to follow if the system took the line feed that ends an incomplete line, and no more.
TEST_F(FileHandleTest, EndsAnIncompleteLineOnce) {
  const rt::Ref<rt::FileHandle> handle = open();
  rlimit before{};
  ASSERT_EQ(getrlimit(RLIMIT_FSIZE, &before), 0);
  const auto handler = std::signal(SIGXFSZ, SIG_IGN);
  rlimit limit = before;
  limit.rlim_cur = 10;
  ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &limit), 0);
  EXPECT_EQ(errorOf(*handle, "0123456789abcdef"), EFBIG);
  limit.rlim_cur = 11;
  ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &limit), 0);
  EXPECT_EQ(errorOf(*handle, "lost"), EFBIG);
  ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &before), 0);
  std::signal(SIGXFSZ, handler);
  handle->writeLine("next");
  EXPECT_EQ(contents(path()), "0123456789\nnext\n");
}

struct Pipe {
  Pipe() {
    if (pipe(ends) != 0) throw std::system_error(errno, std::generic_category());
    fcntl(ends[1], F_SETFL, O_NONBLOCK);
  }
  ~Pipe() {
    close(ends[0]);
    close(ends[1]);
  }
  std::string drain() const {
    std::string text(1 << 20, '\0');
    const ssize_t count = read(ends[0], text.data(), text.size());
    text.resize(count > 0 ? static_cast<std::size_t>(count) : 0);
    return text;
  }
  int ends[2] = {-1, -1};
};

TEST_F(FileHandleTest, DropsALineIfANonBlockingDescriptorIsFull) {
  const Pipe pipe;
  rt::FileHandle& handle =
      *rt::make<rt::FileHandle>(pipe.ends[1], rt::FileHandle::Closing::leavesOpen).detach();
  const std::string block(4096, '.');
  while (write(pipe.ends[1], block.data(), block.size()) > 0) {
  }
  EXPECT_EQ(errorOf(handle, "dropped"), EAGAIN);
  pipe.drain();
  handle.writeLine("kept");
  EXPECT_EQ(pipe.drain(), "kept\n");
  handle.release();
}

TEST_F(FileHandleTest, EndsALineThatANonBlockingDescriptorTookInPart) {
  const Pipe pipe;
  const rt::Ref<rt::FileHandle> handle =
      rt::make<rt::FileHandle>(pipe.ends[1], rt::FileHandle::Closing::leavesOpen);
  const std::string line(1'000'000, 'x');
  std::string read;
  std::thread reader([&] {
    while (!read.ends_with("\n")) read += pipe.drain();
  });
  handle->writeLine(line);
  reader.join();
  EXPECT_EQ(read, line + "\n");
}

TEST_F(FileHandleTest, AllocatesNothingForALine) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  const rt::Ref<rt::FileHandle> handle = open();
  const AllocationCount count;
  handle->writeLine("line");
  EXPECT_EQ(count.allocations(), 0);
}

// Expects each line of each writer once and complete, and the lines of a writer in order.
void expectWholeLines(const std::string& text, int writers, int lines) {
  std::istringstream stream(text);
  std::map<int, int> next;
  int count = 0;
  for (std::string line; std::getline(stream, line); ++count) {
    std::istringstream words(line);
    int writer = -1;
    int number = -1;
    std::string filling;
    ASSERT_TRUE(words >> writer >> number >> filling) << line;
    ASSERT_EQ(next[writer]++, number) << line;
    ASSERT_EQ(filling,
              std::string(static_cast<std::size_t>((number % 300) + 1), static_cast<char>('a' + writer)));
  }
  EXPECT_EQ(count, writers * lines);
}

void writeLines(rt::FileHandle& handle, int writer, int lines) {
  for (int number = 0; number < lines; ++number) {
    handle.writeLine(
        std::to_string(writer) + " " + std::to_string(number) + " " +
        std::string(static_cast<std::size_t>((number % 300) + 1), static_cast<char>('a' + writer)));
  }
}

TEST_F(FileHandleTest, DoesNotMixLinesOfThreads) {
  const rt::Ref<rt::FileHandle> handle = open();
  std::vector<std::thread> threads;
  threads.reserve(8);
  for (int writer = 0; writer < 8; ++writer) {
    threads.emplace_back([&handle, writer] { writeLines(*handle, writer, 500); });
  }
  for (std::thread& thread : threads) thread.join();
  expectWholeLines(contents(path()), 8, 500);
}

TEST_F(FileHandleTest, DoesNotMixLinesOfProcesses) {
  std::vector<pid_t> children;
  for (int writer = 0; writer < 4; ++writer) {
    children.push_back(fork());
    if (children.back() == 0) {
      writeLines(*open(), writer, 500);
      _exit(0);
    }
  }
  for (const pid_t child : children) {
    int status = -1;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    ASSERT_EQ(status, 0);
  }
  expectWholeLines(contents(path()), 4, 500);
}

}  // namespace
