// Runs the example of logging with the machine's own journald in a private root, and reads what it has
// written to all places.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <optional>
#include <string>
#include <vector>

#include "tests/support/PrivateJournal.h"
#include "tests/support/Process.h"

namespace {

using testing::ElementsAre;
using testing::HasSubstr;

// The reason why there is no private journal; empty if there is one.
std::string refusal;

std::vector<std::string> linesOf(const std::filesystem::path& path) {
  std::vector<std::string> lines;
  std::ifstream file(path);
  for (std::string line; std::getline(file, line);) lines.push_back(line);
  return lines;
}

class LoggingExampleTest : public testing::Test {
 protected:
  void SetUp() override {
    if (!PrivateJournal::entered()) GTEST_SKIP() << refusal;
    unsetenv("LUM_LOG");
    journal_.emplace();
    journal_->start();
    std::string name = testing::TempDir() + "logging.XXXXXX";
    ASSERT_NE(mkdtemp(name.data()), nullptr);
    folder_ = name;
  }
  void TearDown() override {
    if (!folder_.empty()) std::filesystem::remove_all(folder_);
  }

  ProcessResult run(const std::vector<std::string>& lists) const {
    std::vector<std::string> arguments = {LOGGING_IMPORTER, folder_};
    for (const std::string& list : lists) arguments.push_back(LISTS "/" + list);
    return runProcess(arguments);
  }

  std::filesystem::path folder_;
  std::optional<PrivateJournal> journal_;
};

TEST_F(LoggingExampleTest, WritesToTheTerminalTheFilesAndTheJournal) {
  const ProcessResult result = run({"prices.txt", "broken.txt"});
  EXPECT_EQ(result.exitStatus, 0);
  EXPECT_THAT(result.standardError, HasSubstr("info  Importer imported path="));
  EXPECT_THAT(result.standardError, testing::Not(HasSubstr("\x1b[")));
  EXPECT_THAT(linesOf(folder_ / "importer.log"),
              ElementsAre(HasSubstr("imported"), HasSubstr("import took"), HasSubstr("\"six\" is no number"),
                          HasSubstr("imported"), HasSubstr("import took")));
  EXPECT_THAT(linesOf(folder_ / "importer.json"),
              ElementsAre(HasSubstr("\"sum\":7"), HasSubstr("\"span.duration\":"),
                          HasSubstr(R"("Body":"\"six\" is no number")"), HasSubstr("\"sum\":12"),
                          HasSubstr("\"span.duration\":")));
  // What preceded the error is there in full, and nothing after it.
  EXPECT_THAT(linesOf(folder_ / "details.log"),
              ElementsAre(HasSubstr("read \"3\""), HasSubstr("read \"4\""), HasSubstr("imported"),
                          HasSubstr("import took"), HasSubstr("read \"5\""), HasSubstr("read \"six\""),
                          HasSubstr("is no number")));

  std::vector<PrivateJournal::Entry> entries = journal_->entries("SUBSYSTEM=com.example.Importer");
  ASSERT_EQ(entries.size(), 4U);
  EXPECT_EQ(entries[0]["PATH"], LISTS "/prices.txt");
  EXPECT_EQ(entries[0]["SUM"], "7");
  EXPECT_THAT(entries[0]["CODE_FILE"], HasSubstr("importer.cpp"));
  EXPECT_EQ(entries[0]["SPAN_ID"], entries[1]["SPAN_ID"]);
  EXPECT_NE(entries[1]["SPAN_ID"], entries[2]["SPAN_ID"]);
  EXPECT_EQ(journal_->entries("SUBSYSTEM=com.example.Parser").size(), 1U);
}

TEST_F(LoggingExampleTest, FollowsTheVariableWithTheLevels) {
  ASSERT_EQ(setenv("LUM_LOG", "error,Importer=info", 1), 0);
  const ProcessResult result = run({"broken.txt"});
  ASSERT_EQ(unsetenv("LUM_LOG"), 0);
  EXPECT_EQ(linesOf(folder_ / "importer.log").size(), 3U);
  EXPECT_THAT(result.standardError, testing::Not(HasSubstr("debug")));
}

TEST_F(LoggingExampleTest, SaysHowItIsUsed) {
  const ProcessResult result = runProcess({LOGGING_IMPORTER});
  EXPECT_EQ(result.exitStatus, 2);
  EXPECT_THAT(result.standardError, HasSubstr("usage: logging-importer FOLDER LIST..."));
}

}  // namespace

int main(int argc, char** argv) {
  testing::InitGoogleTest(&argc, argv);
  if (testing::GTEST_FLAG(list_tests)) return RUN_ALL_TESTS();
  try {
    PrivateJournal::enter();
  } catch (const std::exception& problem) {
    refusal = problem.what();
  }
  return RUN_ALL_TESTS();
}
