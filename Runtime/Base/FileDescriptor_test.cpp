#include "Runtime/Base/FileDescriptor.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <stdexcept>
#include <string>
#include <system_error>
#include <thread>
#include <utility>

namespace {

using testing::HasSubstr;

class FileDescriptor : public testing::Test {
 protected:
  FileDescriptor() {
    if (pipe(ends_.data()) != 0) throw std::runtime_error("no pipe");
    for (const int end : ends_) fcntl(end, F_SETFD, FD_CLOEXEC);
  }
  ~FileDescriptor() override {
    for (const int end : ends_) {
      if (end >= 0) close(end);
    }
  }

  rt::FileDescriptor takeWriter() { return rt::FileDescriptor(std::exchange(ends_[1], -1)); }

  static bool isOpen(int descriptor) { return fcntl(descriptor, F_GETFD) >= 0; }

  std::array<int, 2> ends_{-1, -1};
};

TEST_F(FileDescriptor, IsClosedByItsLastOwner) {
  const int number = ends_[1];
  {
    rt::FileDescriptor first = takeWriter();
    EXPECT_EQ(first.get(), number);
    rt::FileDescriptor second = std::move(first);
    EXPECT_FALSE(first);  // NOLINT(bugprone-use-after-move): moving leaves no descriptor
    rt::FileDescriptor third;
    third = std::move(second);
    EXPECT_TRUE(third);
    EXPECT_TRUE(isOpen(number));
  }
  EXPECT_FALSE(isOpen(number));
}

TEST_F(FileDescriptor, IsClosedInOtherPrograms) {
  const rt::FileDescriptor file = rt::FileDescriptor::open("/dev/null", O_RDONLY);
  EXPECT_EQ(fcntl(file.get(), F_GETFD), FD_CLOEXEC);
}

TEST_F(FileDescriptor, NamesThePathThatCannotBeOpened) {
  try {
    rt::FileDescriptor::open("/no/such/file", O_RDONLY);
    FAIL() << "it was opened";
  } catch (const std::system_error& error) {
    EXPECT_EQ(error.code().value(), ENOENT);
    EXPECT_THAT(error.what(), HasSubstr("/no/such/file"));
  }
}

// The system would not read the path beyond the NUL.
TEST_F(FileDescriptor, RefusesAPathWithANul) {
  EXPECT_THROW(rt::FileDescriptor::open(std::string("/dev/null\0x", 11), O_RDONLY), std::invalid_argument);
}

// The text is longer than a pipe has room for, so it is written in several pieces.
TEST_F(FileDescriptor, WaitsForRoomToWrite) {
  const std::string text(1'000'000, 'x');
  std::string read;
  rt::FileDescriptor writer = takeWriter();
  fcntl(writer.get(), F_SETFL, O_NONBLOCK);
  std::thread reader([&] {
    std::array<char, 4096> bytes{};
    for (ssize_t count; (count = ::read(ends_[0], bytes.data(), bytes.size())) > 0;) {
      read.append(bytes.data(), static_cast<std::size_t>(count));
    }
  });
  writer.write(text);
  writer = rt::FileDescriptor();
  reader.join();
  EXPECT_EQ(read, text);
}

TEST_F(FileDescriptor, ThrowsIfItCannotWrite) {
  const rt::FileDescriptor reader(std::exchange(ends_[0], -1));
  try {
    reader.write("text");
    FAIL() << "it was written";
  } catch (const std::system_error& error) {
    EXPECT_EQ(error.code().value(), EBADF);
  }
  EXPECT_NO_THROW(reader.write(""));
}

}  // namespace
