#include "Foundation/ZEBLoggerMacroHelpers.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "Foundation/ZEBLogBasicFormatter.h"
#include "Runtime/Text/Format.h"

namespace {

using namespace rt::literals;
using testing::ElementsAre;

class Recorder final : public rt::Implements<Recorder, rt::Object, ZEBLogWriter> {
 public:
  void logMessage(const rt::String& message, ZEBLogLevel level) override {
    lines.push_back(std::to_string(level) + " " + std::string(message.view()));
  }
  std::vector<std::string> lines;
};

class FunctionFormatter final : public rt::Implements<FunctionFormatter, ZEBLogBasicFormatter> {
 public:
  rt::String stringForFunc(const rt::String& func, const rt::String& withFormat, std::va_list valist,
                           ZEBLogLevel level) override {
    return rt::format("%@: %@", prettyNameForFunc(func),
                      ZEBLogBasicFormatter::stringForFunc(func, withFormat, valist, level));
  }
};

struct Importer {
  static void importFile(int entries) {
    ZEBLogDebug("debug"_s);
    if (entries > 0)
      ZEBLogInfo("%d%%"_s, entries);
    else
      ZEBLogError("not reached"_s);
    ZEBLogError("plain %@", "literal"_s);
    ZEBLogAssert("%d %@ %s"_s, 1, nullptr, "three");
  }
};

TEST(ZEBLoggerMacroHelpers, LogToTheSharedLoggerWithTheNameOfTheFunction) {
  const auto recorder = rt::make<Recorder>();
  ZEBLogger::setSharedLogger(ZEBLogger::loggerWithWriter(recorder, rt::make<FunctionFormatter>(), nullptr));
  Importer::importFile(7);
  ZEBLogger::setSharedLogger(nullptr);
  EXPECT_THAT(recorder->lines,
              ElementsAre("1 importFile(): debug", "2 importFile(): 7%", "3 importFile(): plain literal",
                          "4 importFile(): 1 (null) three"));
}

}  // namespace
