#pragma once

// A fixture for the tests of the older logger, with its own folder and user defaults. Its writers, formatters
// and filters call functions of the test.

#include <gtest/gtest.h>

#include <cstdarg>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <mutex>
#include <sstream>
#include <string>
#include <utility>
#include <vector>

#include "Foundation/ZEBFileHandleLogWriter.h"
#include "Foundation/ZEBLogger.h"
#include "tests/support/PrivateDefaults.h"

inline const PrivateDefaults privateDefaults;

// Records each line with its level before it.
class Recorder final : public rt::Implements<Recorder, rt::Object, ZEBLogWriter> {
 public:
  void logMessage(const rt::String& message, ZEBLogLevel level) override {
    const std::scoped_lock lock(mutex_);
    lines_.push_back(std::to_string(level) + " " + std::string(message.view()));
  }
  std::vector<std::string> lines() const {
    const std::scoped_lock lock(mutex_);
    return lines_;
  }

 private:
  mutable std::mutex mutex_;
  std::vector<std::string> lines_;
};

class FunctionWriter final : public rt::Implements<FunctionWriter, rt::Object, ZEBLogWriter> {
 public:
  explicit FunctionWriter(std::function<void(const rt::String&)> function) : function_(std::move(function)) {}
  void logMessage(const rt::String& message, ZEBLogLevel /*level*/) override { function_(message); }

 private:
  const std::function<void(const rt::String&)> function_;
};

class FunctionFormatter final : public rt::Implements<FunctionFormatter, rt::Object, ZEBLogFormatter> {
 public:
  explicit FunctionFormatter(std::function<rt::String()> function) : function_(std::move(function)) {}
  rt::String stringForFunc(const rt::String& /*func*/, const rt::String& /*withFormat*/,
                           std::va_list /*valist*/, ZEBLogLevel /*level*/) override {
    return function_();
  }

 private:
  const std::function<rt::String()> function_;
};

class FunctionFilter final : public rt::Implements<FunctionFilter, rt::Object, ZEBLogFilter> {
 public:
  bool filterAllowsMessage(const rt::String& message, ZEBLogLevel level) override {
    return allows(message, level);
  }
  void didAttachToLogger() override { attached(); }
  void willDetachFromLogger() override { detaching(); }

  std::function<bool(const rt::String&, ZEBLogLevel)> allows = [](const auto&, auto) { return true; };
  std::function<void()> attached = [] {};
  std::function<void()> detaching = [] {};
};

class ZEBLoggerTest : public testing::Test {
 protected:
  ZEBLoggerTest() {
    unsetenv("ZEBVerboseLogging");
    std::string path = testing::TempDir() + "ZEBLogger.XXXXXX";
    if (mkdtemp(path.data()) != nullptr) directory_ = path;
  }
  ~ZEBLoggerTest() override {
    ZEBLogger::setSharedLogger(nullptr);
    std::filesystem::remove_all(directory_);
  }

  std::filesystem::path path(const char* name = "log") const { return directory_ / name; }
  rt::String pathText(const char* name = "log") const { return rt::String::fromUTF8(path(name).c_str()); }
  std::string contents() const {
    std::ostringstream text;
    text << std::ifstream(path()).rdbuf();
    return text.str();
  }

  rt::Ref<ZEBLogger> recordingLogger() const {
    return ZEBLogger::loggerWithWriter(recorder_, nullptr, nullptr);
  }

  const rt::Ref<Recorder> recorder_ = rt::make<Recorder>();

 private:
  std::filesystem::path directory_;
};

template <class T>
bool isA(const auto& ref) {
  return rt::cast<T>(ref) != nullptr;
}

inline rt::Ref<rt::FileHandle> fileHandleOf(ZEBLogger& logger) {
  const auto writer = rt::cast<ZEBFileHandleLogWriter>(logger.writer());
  return writer ? writer->fileHandle() : nullptr;
}
