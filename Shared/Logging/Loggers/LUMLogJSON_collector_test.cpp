// A collector of logs reads the lines, with the configuration that the documents quote.

#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <string_view>

#include "Runtime/Process/Bundle.h"
#include "Shared/Logging/LUMLog.h"
#include "Shared/Logging/LUMLogDropAllFilter.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/LUMSystemLogger.h"
#include "Shared/Logging/Loggers/LUMLogCapture.h"
#include "Shared/Logging/Loggers/LUMLogJSON.h"
#include "Shared/Logging/Loggers/Private/LUMLogRenderedLine.h"
#include "tests/support/Process.h"
#include "tests/support/TemporaryFolder.h"

namespace {

using namespace rt::literals;

constexpr const char* kCollector = "/usr/sbin/rsyslogd";

class LUMLogJSONCollectorTest : public testing::Test {
 protected:
  // Keeps the messages out of the system's log.
  static void SetUpTestSuite() {
    LUMLogMultiplexer::sharedInstance()->addSyncLogger(
        LUMSystemLogger::initWithFilter(LUMLogDropAllFilter::init()));
  }
  void SetUp() override {
    if (access(kCollector, X_OK) != 0) GTEST_SKIP() << "rsyslog is not installed";
    rt::Bundle::setMainIdentifier("com.example.host"_s);
    std::filesystem::create_directory(folder_.file("hosts"));
    std::filesystem::create_directory(folder_.file("work"));

    // The configuration of the documents, with other paths.
    std::ifstream file(CONFIGURATION);
    std::string text{std::istreambuf_iterator<char>(file), {}};
    constexpr std::string_view kFolder = "/var/log";
    for (std::size_t at = 0; (at = text.find(kFolder, at)) != std::string::npos; at += folder_.path().size())
      text.replace(at, kFolder.size(), folder_.path());
    std::ofstream(configuration_) << "global(workDirectory=\"" << folder_.file("work") << "\")\n" << text;

    // The collector writes into a pipe, so that the test can wait for a line.
    ASSERT_EQ(mkfifo(folder_.file("errors.json").c_str(), 0600), 0);
    errors_ = open(folder_.file("errors.json").c_str(), O_RDWR | O_CLOEXEC);
    ASSERT_GE(errors_, 0);
  }
  void TearDown() override {
    if (errors_ >= 0) close(errors_);
    rt::Bundle::setMainIdentifier(nullptr);
  }

  // Appends the lines of what was logged to the file of a host.
  void write() {
    const rt::Ref<LUMLogJSON> json = LUMLogJSON::init();
    std::ofstream file(folder_.file("hosts/host.json"), std::ios::app | std::ios::binary);
    for (const rt::Ref<LUMLogMessage>& message : capture_.takeMessages())
      file << LUMLogRenderedLine(*json, *message, "\n").text();
  }

  // Waits for the next line of the collector.
  std::string nextError() const {
    constexpr int kPatienceInMilliseconds = 60'000;
    std::string line;
    for (pollfd waiting{.fd = errors_, .events = POLLIN, .revents = 0};
         poll(&waiting, 1, kPatienceInMilliseconds) == 1;) {
      char byte = 0;
      if (read(errors_, &byte, 1) != 1) break;
      if (byte == '\n') return line;
      line += byte;
    }
    return "no whole line, only \"" + line + '"';
  }

  const TemporaryFolder folder_;
  const std::string configuration_ = folder_.file("rsyslog.conf");
  LUMLogCapture capture_;
  int errors_ = -1;
};

TEST_F(LUMLogJSONCollectorTest, ReadsTheLines) {
  const ProcessResult check = runProcess({kCollector, "-N1", "-f", configuration_});
  ASSERT_EQ(check.exitStatus, 0) << check.standardError;

  const rt::Ref<LUMLogMetadata> importer = LUMLogMetadata::metadataWithComponent("Importer"_s);
  LUMLogAt(LUMLogLevelInfo, importer, "started"_s, LUMLogField("user", "ann"));
  LUMLogAt(LUMLogLevelError, importer, "no \"route\"\n to \xC3\xA4"_s, LUMLogField("user", "ann"));
  LUMLogAt(LUMLogLevelFault, "%@"_s, rt::String::fromUTF8(std::string(5000, 'x')), LUMLogField("user", 42));
  write();

  const RunningProcess collector({kCollector, "-n", "-f", configuration_, "-iNONE"});
  EXPECT_EQ(nextError(), R"({"host":"com.example.host", "component":"Importer",)"
                         " \"text\":\"no \\\"route\\\"\\n to \xC3\xA4\", \"user\":\"ann\"}");
  EXPECT_EQ(nextError(), R"({"host":"com.example.host", "component":"", "text":")" + std::string(5000, 'x') +
                             R"(", "user":"42"})");

  // It also follows the file.
  LUMLogAt(LUMLogLevelError, "later"_s, LUMLogField("user", "bob"));
  write();
  EXPECT_EQ(nextError(), R"({"host":"com.example.host", "component":"", "text":"later", "user":"bob"})");
}

}  // namespace
