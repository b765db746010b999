// Runs small programs that were built for macOS. Most of them check themselves: they print what is not so.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <csignal>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <sstream>
#include <string>
#include <vector>

#include "tests/support/Process.h"

namespace {

namespace fs = std::filesystem;
using testing::AllOf;
using testing::HasSubstr;

// Each test runs the programs whose fixups are opcodes, and those whose fixups are chains.
class Runner : public testing::TestWithParam<const char*> {
 protected:
  void SetUp() override {
    std::string pattern = "/tmp/macos-runner_test.XXXXXX";
    ASSERT_NE(mkdtemp(pattern.data()), nullptr);
    folder_ = pattern;
  }
  void TearDown() override { fs::remove_all(folder_); }

  static std::string path(const std::string& name, const std::string& suffix = "") {
    return PROGRAMS "/macos-" + name + GetParam() + suffix;
  }

  // Runs the program in an empty folder.
  ProcessResult run(const std::string& name, std::vector<std::string> arguments = {}) const {
    arguments.insert(arguments.begin(), {RUNNER, path(name)});
    return runProcess(arguments, [&] { EXPECT_EQ(chdir(folder_.c_str()), 0); });
  }

  static void expectGood(const ProcessResult& result) {
    EXPECT_EQ(result.standardError, "");
    EXPECT_EQ(result.exitStatus, 0);
  }

  const fs::path& folder() const { return folder_; }

 private:
  fs::path folder_;
};

INSTANTIATE_TEST_SUITE_P(Opcodes, Runner, testing::Values(""));
INSTANTIATE_TEST_SUITE_P(Chains, Runner, testing::Values("-chained"));

TEST_P(Runner, FixesUpPointersIntoTheImageAndIntoLibraries) {
  expectGood(run("fixups"));
}

TEST_P(Runner, FixesUpPointersFarBehindALibrary) {
  expectGood(run("fixups-far"));
}

TEST_P(Runner, InitialisesLibrariesFirstAndFilesInTheOrderOfTheLinker) {
  const ProcessResult result = run("initialisers", {path("initialisers-opened", ".bundle")});
  expectGood(result);
  EXPECT_EQ(result.standardOutput,
            "inner library\nouter library\nfirst file\nsecond file, early\nsecond file\nmain\n"
            "opened bundle\nclosed once\nend of opened bundle\nclosed\n"
            "end of second file\nend of first file\nend of outer library\nend of inner library\n");
}

TEST_P(Runner, GivesEachThreadItsOwnVariables) {
  expectGood(run("thread-locals"));
}

TEST_P(Runner, PassesExceptionsBetweenImages) {
  expectGood(run("exceptions"));
}

TEST_P(Runner, EndsAProgramThatDoesNotCatchAnException) {
  const ProcessResult result = run("exceptions", {"terminate"});
  EXPECT_EQ(result.signal, SIGABRT);
  EXPECT_THAT(result.standardError, HasSubstr("terminating due to uncaught exception of type Problem"));
}

TEST_P(Runner, OpensAndClosesBundles) {
  expectGood(run("opening", {path("opened", ".bundle")}));
}

TEST_P(Runner, UnloadsABundleThatIsNotUsed) {
  EXPECT_EQ(run("opening", {path("opened", ".bundle"), "crash"}).signal, SIGSEGV);
}

TEST_P(Runner, TranslatesCallsForFiles) {
  expectGood(run("system", {"files"}));
}

TEST_P(Runner, TranslatesTheMarkOfPipesThatSendNoSignal) {
  expectGood(run("system", {"pipes"}));
}

TEST_P(Runner, TranslatesSignals) {
  expectGood(run("system", {"signals"}));
}

TEST_P(Runner, ForksProcesses) {
  expectGood(run("system", {"processes"}));
}

TEST_P(Runner, ExecutesPrograms) {
  const ProcessResult result = run("system", {"executing"});
  expectGood(result);
  EXPECT_EQ(result.standardOutput, "another name");
}

TEST_P(Runner, TranslatesThreadsAndLocks) {
  expectGood(run("system", {"threads"}));
}

TEST_P(Runner, EndsAProgramThatUnlocksAnotherThreadsLock) {
  EXPECT_EQ(run("system", {"foreign-unlock"}).signal, SIGILL);
}

TEST_P(Runner, WatchesFolders) {
  expectGood(run("system", {"queue"}));
}

TEST_P(Runner, WritesTheLogIntoAFile) {
  const fs::path log = folder() / "log";
  setenv("MACOS_RUNNER_LOG", log.c_str(), 1);
  expectGood(run("system", {"log"}));
  unsetenv("MACOS_RUNNER_LOG");
  std::ostringstream written;
  written << std::ifstream(log).rdbuf();
  EXPECT_EQ(written.str(), "10 [com.example:net] a text, <private>\n");
}

TEST_P(Runner, NamesUnknownImportsBeforeAnythingRuns) {
  const ProcessResult result = run("unknown-import");
  EXPECT_EQ(result.exitStatus, 125);
  EXPECT_EQ(result.standardOutput, "");
  EXPECT_EQ(result.standardError,
            "macos-runner: neither an image nor a shim has these names:\n  _acl_valid (" +
                path("unknown-import") + ")\n  _copyfile (" + path("unknown-import") + ")\n");
}

TEST_P(Runner, RefusesWhatAShimDoesNotKnow) {
  const ProcessResult result = run("system", {"unknown-command"});
  EXPECT_EQ(result.exitStatus, 125);
  EXPECT_EQ(result.standardOutput, "");
  EXPECT_EQ(result.standardError, "macos-runner: fcntl is called with the command 63\n");
}

TEST_P(Runner, RefusesAFileThatIsNotForThisProcessor) {
  const fs::path text = folder() / "text";
  std::ofstream(text) << "text";
  const ProcessResult result = runProcess({RUNNER, text});
  EXPECT_EQ(result.exitStatus, 125);
  EXPECT_EQ(result.standardError, "macos-runner: " + text.string() + " is not a Mach-O file for x86-64\n");
}

TEST_P(Runner, RefusesAFileThatEndsTooEarly) {
  std::ifstream whole(path("fixups"), std::ios::binary);
  std::string bytes((std::istreambuf_iterator<char>(whole)), {});
  for (const std::size_t size : {40UL, 1000UL, bytes.size() / 2, bytes.size() - 2000}) {
    const fs::path part = folder() / "part";
    std::ofstream(part, std::ios::binary) << bytes.substr(0, size);
    const ProcessResult result = runProcess({RUNNER, part});
    EXPECT_EQ(result.exitStatus, 125) << size;
    EXPECT_EQ(result.standardError, "macos-runner: a Mach-O file ends in the middle of what it says\n")
        << size;
  }
}

TEST_P(Runner, JoinsAProgram) {
  const fs::path joined = folder() / "joined";
  expectGood(runProcess({RUNNER, "--join", path("system"), joined}));
  expectGood(runProcess({joined, "threads"}));
}

// Returns the path of a program of the build. Empty if there is none.
fs::path programNamed(const std::string& name) {
  for (const fs::directory_entry& entry : fs::recursive_directory_iterator(fs::path(PROGRAMS) / "../../..")) {
    if (entry.path().filename() == name && entry.is_regular_file()) return entry.path().lexically_normal();
  }
  return {};
}

// A line with a misspelt name would exclude nothing, and nobody would notice.
TEST(NotShown, NamesCasesThatExist) {
  std::ifstream list(NOT_SHOWN);
  for (std::string line; std::getline(list, line);) {
    if (line.empty() || line.starts_with('#')) continue;
    SCOPED_TRACE(line);
    std::istringstream words(line);
    std::string program;
    std::string suite;
    std::string name;
    words >> program;
    std::getline(words >> std::ws, suite, '.');
    words >> name;
    const fs::path path = programNamed(program);
    ASSERT_FALSE(path.empty());
    std::vector<std::string> arguments = {path, "--gtest_list_tests"};
    // Those of the command are programs for Linux.
    if (!program.starts_with("mount-point_")) arguments.insert(arguments.begin(), RUNNER);
    EXPECT_THAT(runProcess(arguments).standardOutput,
                AllOf(HasSubstr(suite + ".\n"), HasSubstr("  " + name + "\n")));
  }
}

}  // namespace
