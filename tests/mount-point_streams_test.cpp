// Tests the mount-point command when its messages cannot be written.

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <csignal>
#include <filesystem>
#include <fstream>

#include "tests/support/MountPointTest.h"

namespace {

namespace fs = std::filesystem;

// ---- Standard streams ----

void replaceStream(int stream, const char* path) {
  const int file = open(path, O_WRONLY);
  require(file >= 0);
  require(dup2(file, stream) == stream);
}

TEST_F(MountPointTest, WorksWithoutStandardStreams) {
  const auto closeAll = [] {
    for (const int stream : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO}) close(stream);
  };
  expectSuccess(run({"a"}, closeAll));
  EXPECT_EQ(volumes(), std::vector<std::string>{"a"});
  expectSuccess(run({"a", "--remove"}, closeAll));
  expectSuccess(run({"a", "--remove"}, closeAll));
  expectResult(run({}, closeAll), 22, "");
  expectResult(run({"a/b"}, closeAll), 22, "");
}

// The exit status is the value of errno after the message was written. If the message itself cannot be
// written, the status is the error of that write, not the directory's error.
TEST_F(MountPointTest, ReportsTheFailureOfItsMessage) {
  expectSuccess(run({"a"}));
  expectResult(run({"a"}, [] { close(STDERR_FILENO); }), EBADF, "");
  expectResult(run({"a"}, [] { replaceStream(STDERR_FILENO, "/dev/full"); }), ENOSPC, "");
  expectResult(run({"a", "--remove", "x"}, [] { replaceStream(STDERR_FILENO, "/dev/full"); }), ENOSPC, "");
  fs::create_directory("/Volumes/a/b");
  expectResult(run({"a", "--remove"}, [] { replaceStream(STDERR_FILENO, "/dev/full"); }), ENOSPC, "");
}

TEST_F(MountPointTest, ReportsTheFailureOfItsMessageAfterChown) {
  if (const std::string problem = tracingRefusal(); !problem.empty()) GTEST_SKIP() << problem;
  expectResult(runInjected("chown,fchown,lchown,fchownat", "EPERM", {"a"},
                           [] { replaceStream(STDERR_FILENO, "/dev/full"); }),
               ENOSPC, "");
  expectResult(runInjected("chown,fchown,lchown,fchownat", "EPERM", {"b"}, [] { close(STDERR_FILENO); }),
               EBADF, "");
}

// A full pipe.
struct FullPipe {
  std::array<int, 2> ends{};
  std::size_t size = 0;

  FullPipe() {
    require(pipe2(ends.data(), O_CLOEXEC | O_NONBLOCK) == 0);
    const std::string block(4096, '.');
    for (ssize_t count = 1; count > 0;) {
      count = write(ends[1], block.data(), block.size());
      if (count > 0) size += static_cast<std::size_t>(count);
    }
    require(errno == EAGAIN);
  }
};

TEST_F(MountPointTest, TreatsAMissingDirectoryAsRemovedEvenIfTheNoticeIsLost) {
  expectSuccess(run({"a", "--remove"}, [] { close(STDOUT_FILENO); }));
  expectSuccess(run({"a", "--remove"}, [] { replaceStream(STDOUT_FILENO, "/dev/full"); }));
  const FullPipe pipe;
  expectSuccess(run({"a", "--remove"}, [&] { dup2(pipe.ends[1], STDOUT_FILENO); }));
}

TEST_F(MountPointTest, DoesItsWorkBeforeABrokenPipeEndsIt) {
  const auto withoutReader = [](int stream, bool ignored) {
    return [stream, ignored] {
      std::array<int, 2> ends{};
      require(pipe(ends.data()) == 0 && close(ends[0]) == 0 && dup2(ends[1], stream) == stream);
      close(ends[1]);
      require(std::signal(SIGPIPE, ignored ? SIG_IGN : SIG_DFL) != SIG_ERR);
    };
  };
  expectSuccess(run({"a"}, withoutReader(STDERR_FILENO, false)));
  EXPECT_EQ(run({"a"}, withoutReader(STDERR_FILENO, false)).signal, SIGPIPE);
  expectResult(run({"a"}, withoutReader(STDERR_FILENO, true)), EPIPE, "");
  EXPECT_EQ(run({"b", "--remove"}, withoutReader(STDOUT_FILENO, false)).signal, SIGPIPE);
  expectSuccess(run({"b", "--remove"}, withoutReader(STDOUT_FILENO, true)));
}

TEST_F(MountPointTest, DoesNotWaitForAFullNonBlockingPipe) {
  FullPipe pipe;
  expectSuccess(run({"a"}));
  expectResult(run({"a"}, [&] { dup2(pipe.ends[1], STDERR_FILENO); }), numberOf(EAGAIN), "");
}

TEST_F(MountPointTest, WaitsForAFullPipeWithOneThreadAndLosesNothing) {
  FullPipe pipe;
  ASSERT_EQ(fcntl(pipe.ends[1], F_SETFL, 0), 0);
  ASSERT_EQ(fcntl(pipe.ends[0], F_SETFL, 0), 0);
  expectSuccess(run({"a"}));
  const pid_t child = fork();
  if (child == 0) {
    dup2(pipe.ends[1], STDERR_FILENO);
    execl(kCommand, kCommand, "a", nullptr);
    _exit(127);
  }
  close(pipe.ends[1]);

  // Waits until the command sleeps in its write: system call 1 with descriptor 2 as its first argument.
  const std::string process = "/proc/" + std::to_string(child);
  int status = 0;
  for (std::string call; !call.starts_with("1 0x2 ");) {
    ASSERT_EQ(waitpid(child, &status, WNOHANG), 0) << "it ended without waiting";
    std::ifstream file(process + "/syscall");
    if (!file.is_open()) break;  // Some kernels lack this file. The check below still works.
    std::getline(file, call);
    usleep(1000);
  }
  const auto threads = std::distance(fs::directory_iterator(process + "/task"), fs::directory_iterator());
  EXPECT_TRUE(threads == 1 || kInstrumentation == "thread") << threads;  // The sanitizer may start a thread.

  std::string text;
  std::array<char, 65536> buffer{};
  for (ssize_t count; (count = read(pipe.ends[0], buffer.data(), buffer.size())) > 0;) {
    text.append(buffer.data(), static_cast<std::size_t>(count));
  }
  EXPECT_EQ(text.substr(pipe.size), "Failed to create [/Volumes/a], errno: 17\n");
  ASSERT_EQ(waitpid(child, &status, 0), child);
  EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 17);
}

}  // namespace
