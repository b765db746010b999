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

/// Throws std::system_error with `errno` if `succeeded` is false.
void require(bool succeeded);

/// Runs the built command in a private root. Its /Volumes is real, and empty at the start of each case.
/// MountPointTest.cpp defines `main`.
///
/// With the argument --as-ordinary-user, a test program that root starts runs as an ordinary user. A case
/// that needs another user is skipped.
class MountPointTest : public testing::Test {
 protected:
  /// The command under test. It is a copy in the private root, so that an ordinary user may run it whoever
  /// built it.
  static constexpr const char* kCommand = "/mount-point";
  /// The command's instrumentation: "", "coverage" or the name of a sanitizer.
  static constexpr std::string_view kInstrumentation = INSTRUMENTATION;
#ifdef COMMAND_IS_FOR_MACOS
  static constexpr bool kIsForMacOS = true;
#else
  static constexpr bool kIsForMacOS = false;
#endif

  /// Returns the number of an error, for example EAGAIN, on the system that the command is for. Several
  /// differ.
  static int numberOf(int error);

  void SetUp() override;

  /// Returns whether the program runs as the machine's root, who may use all user and group identifiers.
  /// Otherwise it runs as the root of a user namespace in which only one of each is mapped.
  static bool isMachineRoot();

  static ProcessResult run(std::vector<std::string> arguments, const std::function<void()>& beforeExec = {});

  /// Runs the command and makes the system calls in `calls` (comma-separated) fail with `error`. `error` has
  /// strace's syntax, for example "EINTR:when=1".
  static ProcessResult runInjected(const std::string& calls, const std::string& error,
                                   const std::vector<std::string>& arguments,
                                   const std::function<void()>& beforeExec = {});

  /// Runs the command and returns its system calls, one line of strace's output each. Leaves out the calls
  /// that start the program.
  static std::vector<std::string> systemCalls(const std::vector<std::string>& arguments,
                                              const std::function<void()>& beforeExec = leaveLeaksAlone);

  /// Runs the command without root's capabilities.
  static ProcessResult runPowerless(const std::vector<std::string>& arguments);

  /// Turns off the leak checker of an instrumented build. It cannot work while the process is traced, nor if
  /// the process may not trace others of the same user. Call it before the program starts.
  static void leaveLeaksAlone();

  static void expectResult(const ProcessResult& result, int exitStatus, const std::string& standardError,
                           const std::string& standardOutput = "");
  static void expectSuccess(const ProcessResult& result);

  static void makeFile(const std::filesystem::path& path);
  static struct stat statusOf(const std::filesystem::path& path);
  static std::vector<std::string> volumes();
};
