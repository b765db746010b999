#pragma once

/// A fixture for tests that exchange property lists with Python's plistlib. It has a file in its own
/// directory. Its scripts have plistlib imported, and the file's path in `path`.
///
///     class KeyedArchiveAndPython : public PlistlibTest {};
///
///     TEST_F(KeyedArchiveAndPython, PythonReadsOurArchives) {
///       writeFile(rt::KeyedArchiver::archivedDataWithRootObject(number));
///       EXPECT_EQ(python("print(plistlib.load(open(path, 'rb')))"), "7\n");
///     }
///
/// Skips its tests if the machine has no python3 with plistlib.
///
/// Not for: anything but tests.

#include <gtest/gtest.h>
#include <stdlib.h>

#include <cstddef>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <span>
#include <string>
#include <vector>

#include "tests/support/Process.h"

class PlistlibTest : public testing::Test {
 protected:
  void SetUp() override {
    if (runProcess({"python3", "-c", "import plistlib"}).exitStatus != 0) {
      GTEST_SKIP() << "python3 with plistlib is missing";
    }
    std::string directory = testing::TempDir() + "plistlib.XXXXXX";
    ASSERT_NE(mkdtemp(directory.data()), nullptr);
    directory_ = directory;
  }
  void TearDown() override {
    if (!directory_.empty()) std::filesystem::remove_all(directory_);
  }

  /// Runs `script` and returns its output. The test fails if the script fails.
  std::string python(const std::string& script) const {
    const ProcessResult result =
        runProcess({"python3", "-c", "import plistlib, sys\npath = sys.argv[1]\n" + script, path()});
    EXPECT_EQ(result.exitStatus, 0) << result.standardError;
    return result.standardOutput;
  }
  std::string path() const { return directory_ / "file"; }

  /// Replaces the file's content with `bytes`.
  void writeFile(std::span<const std::byte> bytes) const {
    std::ofstream(path(), std::ios::binary)
        .write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
  }
  /// Returns the file's content.
  std::vector<std::byte> readFile() const {
    std::ifstream stream(path(), std::ios::binary);
    const std::string content{std::istreambuf_iterator<char>(stream), {}};
    const std::span<const std::byte> bytes = std::as_bytes(std::span(content));
    return {bytes.begin(), bytes.end()};
  }

 private:
  std::filesystem::path directory_;
};
