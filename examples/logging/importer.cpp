// Adds up the numbers in lists that have one on each line. This is how a program logs that an operator runs:
//     $ LUM_LOG='info,Parser=debug' logging-importer FOLDER LIST...
//
// Its lines go to the terminal and to the system's log, to FOLDER/importer.log, which is rotated, and to
// FOLDER/importer.json for programs. At an error, FOLDER/details.log gets all that preceded it.

#include <charconv>
#include <cstdio>
#include <fstream>
#include <string>

#include "Shared/Logging/Loggers/Loggers.h"

using namespace rt::literals;

extern "C" const char kMainBundleIdentifier[] = "com.example";

namespace {

void beginLogging(const char* folder) {
  const auto in = [folder](const char* name) { return rt::format("%s/%s", folder, name); };
  const rt::Ref<LUMLogMultiplexer>& multiplexer = LUMLogMultiplexer::sharedInstance();
  const rt::Ref<LUMLogLevels>& levels = LUMLogLevels::sharedInstance();

  LUMTerminalLoggerOptions terminal;
  terminal.filter = levels;
  terminal.formatter =
      LUMLogPattern::initWithPattern("{time:%H:%M:%S.%3f} {level:<5} {component:<8} {text} {fields}"_s);
  multiplexer->addSyncLogger(LUMTerminalLogger::init(terminal));
  multiplexer->addSyncLogger(LUMSystemLogger::initWithFilter(levels));

  LUMFileLoggerOptions rotated;
  rotated.filter = levels;
  rotated.rotationSize = 1'000'000;
  rotated.bufferSize = 64 * 1024;
  multiplexer->addSyncLogger(
      LUMBoundedLogger::initWithLogger(LUMFileLogger::initWithPath(in("importer.log"), rotated)));
  multiplexer->addSyncLogger(LUMBoundedLogger::initWithLogger(
      LUMFileLogger::initWithPath(in("importer.json"), LUMLogJSON::init(), levels)));
  multiplexer->addSyncLogger(LUMRingLogger::initWithLogger(LUMFileLogger::initWithPath(in("details.log"))));
  LUMLogCrash::install();
}

int numberIn(const std::string& line) {
  static const rt::Ref<LUMLogMetadata> parser = LUMLogMetadata::metadataWithComponent("Parser"_s);
  static LUMLogLimit limit = LUMLogLimit::onePer(1);  // second
  LUMLogAt(LUMLogLevelDebug, parser, "read \"%@\""_s, line);
  int number = 0;
  const bool isNumber = std::from_chars(line.data(), line.data() + line.size(), number).ec == std::errc();
  if (!isNumber && limit.allows()) LUMLogAt(LUMLogLevelError, parser, "\"%@\" is no number"_s, line);
  return number;
}

void importList(const std::string& path) {
  const LUMLogSpan span(LUMLogLevelInfo, "import"_s, LUMLogField("path", path));
  std::ifstream list(path);
  if (!list) {
    LUMLogAt(LUMLogLevelError, "the list cannot be opened"_s);
    return;
  }
  int sum = 0;
  for (std::string line; std::getline(list, line);) sum += numberIn(line);
  LUMLogAt(LUMLogLevelInfo, "imported"_s, LUMLogField("sum", sum));
}

}  // namespace

int main(int argc, char** argv) {
  if (argc < 3) {
    std::fputs("usage: logging-importer FOLDER LIST...\n", stderr);
    return 2;
  }
  beginLogging(argv[1]);
  const LUMLogScope scope(LUMLogMetadata::metadataWithComponent("Importer"_s));
  const rt::Ref<rt::Queue> queue = rt::make<rt::Queue>("import"_s);
  for (int i = 2; i < argc; ++i) queue->async([path = std::string(argv[i])] { importList(path); });
  queue->barrierSync();
  return 0;
}
