#include "Foundation/ZEBFileHandleLogWriter.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

namespace {

using namespace rt::literals;
namespace fs = std::filesystem;

class ZEBFileHandleLogWriterTest : public testing::Test {
 protected:
  ZEBFileHandleLogWriterTest() {
    std::string path = testing::TempDir() + "ZEBFileHandleLogWriter.XXXXXX";
    if (mkdtemp(path.data()) != nullptr) directory_ = path;
  }
  ~ZEBFileHandleLogWriterTest() override { fs::remove_all(directory_); }

  fs::path path(const char* name = "log") const { return directory_ / name; }
  rt::Ref<ZEBFileHandleLogWriter> open(std::uint16_t mode = 0644) const {
    return ZEBFileHandleLogWriter::fileHandleForLoggingAtPath(rt::String::fromUTF8(path().c_str()), mode);
  }
  std::string contents() const {
    std::ostringstream text;
    text << std::ifstream(path()).rdbuf();
    return text.str();
  }

 private:
  fs::path directory_;
};

TEST_F(ZEBFileHandleLogWriterTest, CreatesTheFileWithTheMode) {
  const mode_t before = umask(022);
  const auto writer = open(0666);
  umask(before);
  ASSERT_TRUE(writer);
  EXPECT_EQ(static_cast<unsigned>(fs::status(path()).permissions()), 0644U);
  const int flags = fcntl(writer->fileHandle()->descriptor(), F_GETFL);
  EXPECT_EQ(flags & (O_ACCMODE | O_APPEND), O_WRONLY | O_APPEND);
}

TEST_F(ZEBFileHandleLogWriterTest, IsNullWithoutAFile) {
  EXPECT_FALSE(ZEBFileHandleLogWriter::fileHandleForLoggingAtPath(nullptr, 0644));
  EXPECT_FALSE(ZEBFileHandleLogWriter::fileHandleForLoggingAtPath("/no/such/folder/log"_s, 0644));
  EXPECT_FALSE(ZEBFileHandleLogWriter::initWithFileHandle(nullptr));
}

TEST_F(ZEBFileHandleLogWriterTest, WritesLinesOfEveryLevel) {
  std::ofstream(path()) << "before\n";
  const auto writer = open();
  for (const ZEBLogLevel level : {-1, 0, 4, 99}) writer->logMessage("größe %d %@"_s, level);
  writer->logMessage(""_s, 1);
  writer->logMessage(nullptr, 1);
  EXPECT_EQ(contents(), "before\ngröße %d %@\ngröße %d %@\ngröße %d %@\ngröße %d %@\n\n(null)\n");
}

TEST_F(ZEBFileHandleLogWriterTest, ClosesTheFileWhenDestroyed) {
  auto writer = open();
  const int descriptor = writer->fileHandle()->descriptor();
  EXPECT_NE(fcntl(descriptor, F_GETFD), -1);
  writer = nullptr;
  EXPECT_EQ(fcntl(descriptor, F_GETFD), -1);
}

TEST_F(ZEBFileHandleLogWriterTest, IgnoresAFullDisk) {
  if (!fs::exists("/dev/full")) GTEST_SKIP() << "no /dev/full here";
  const auto writer = ZEBFileHandleLogWriter::fileHandleForLoggingAtPath("/dev/full"_s, 0644);
  ASSERT_TRUE(writer);
  writer->logMessage("lost"_s, 3);
  writer->logMessage("lost, too"_s, 3);
  // It writes again as soon as there is room.
  const int descriptor = writer->fileHandle()->descriptor();
  const int other = ::open(path().c_str(), O_WRONLY | O_APPEND | O_CREAT | O_CLOEXEC, 0600);
  ASSERT_GE(other, 0);
  ASSERT_EQ(dup2(other, descriptor), descriptor);
  close(other);
  writer->logMessage("next"_s, 3);
  EXPECT_EQ(contents(), "next\n");
}

TEST_F(ZEBFileHandleLogWriterTest, IgnoresAClosedDescriptor) {
  const auto writer = open();
  const int descriptor = writer->fileHandle()->descriptor();
  const int kept = dup(descriptor);
  ASSERT_GE(kept, 0);
  close(descriptor);
  writer->logMessage("lost"_s, 3);
  ASSERT_EQ(dup2(kept, descriptor), descriptor);
  close(kept);
  writer->logMessage("next"_s, 3);
  EXPECT_EQ(contents(), "next\n");
}

TEST_F(ZEBFileHandleLogWriterTest, WritesToAFileThatWasRemoved) {
  const auto writer = open();
  fs::remove(path());
  writer->logMessage("to nobody"_s, 3);
  EXPECT_FALSE(fs::exists(path()));
  struct stat status{};
  ASSERT_EQ(fstat(writer->fileHandle()->descriptor(), &status), 0);
  EXPECT_EQ(status.st_size, 10);
}

TEST_F(ZEBFileHandleLogWriterTest, KeepsLinesWholeIfWritersShareAHandle) {
  // Two writers share a handle.
  const auto first = open();
  const auto second = ZEBFileHandleLogWriter::initWithFileHandle(first->fileHandle());
  const rt::String line = rt::String::fromUTF8(std::string(3000, 'x'));
  std::vector<std::thread> threads;
  threads.reserve(2);
  for (const auto& writer : {first, second}) {
    threads.emplace_back([&, writer] {
      for (int i = 0; i < 200; ++i) writer->logMessage(line, 1);
    });
  }
  for (std::thread& thread : threads) thread.join();
  std::ifstream stream(path());
  int count = 0;
  for (std::string text; std::getline(stream, text); ++count) ASSERT_EQ(text, line.view());
  EXPECT_EQ(count, 400);
}

}  // namespace
