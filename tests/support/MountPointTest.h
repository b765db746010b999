#pragma once

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <filesystem>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "tests/support/PrivateRoot.h"
#include "tests/support/Process.h"

/// Throws std::system_error with `errno` where a call has not succeeded.
void require(bool succeeded);

/// Runs the built command in a private root, on a real /Volumes that each case finds empty. The test programs
/// with it run as root and, with the argument --as-ordinary-user, once more as an ordinary user; what one of
/// them cannot do is skipped. Brings `main`.
class MountPointTest : public testing::Test {
 protected:
  /// The command under test: a copy in the private root, where an ordinary user may run it whoever built it.
  static constexpr const char* kCommand = "/mount-point";
  /// What the compiler added to the command under test: nothing, or the name of a sanitizer or "coverage".
  static constexpr std::string_view kInstrumentation = INSTRUMENTATION;

  void SetUp() override;

  /// Whether the program runs as the machine's root, with all identifiers at hand, and not as the root of a
  /// user namespace in which only one is mapped.
  static bool isMachineRoot();

  static ProcessResult run(std::vector<std::string> arguments, const std::function<void()>& beforeExec = {});

  /// Runs the command with the system calls of `calls` (comma-separated) failing with `error`. strace says
  /// more of `error`, as in "EINTR:when=1".
  static ProcessResult runInjected(const std::string& calls, const std::string& error,
                                   const std::vector<std::string>& arguments,
                                   const std::function<void()>& beforeExec = {});

  /// What the command, once it has started, asks the system for, a line each as strace writes it.
  static std::vector<std::string> systemCalls(const std::vector<std::string>& arguments,
                                              const std::function<void()>& beforeExec = leaveLeaksAlone);

  /// Runs the command with none of root's capabilities.
  static ProcessResult runPowerless(const std::vector<std::string>& arguments);

  /// The leak checker of an instrumented build cannot work below a tracer, nor where the process may not
  /// trace its like; called before the program starts.
  static void leaveLeaksAlone();

  static void expectResult(const ProcessResult& result, int exitStatus, const std::string& standardError,
                           const std::string& standardOutput = "");
  static void expectSuccess(const ProcessResult& result);

  static void makeFile(const std::filesystem::path& path);
  static struct stat statusOf(const std::filesystem::path& path);
  static std::vector<std::string> volumes();
};
