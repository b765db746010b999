#pragma once

// Declares the names that the examples in the comments of headers use without declaring them.
// tests/check-header-examples compiles this header with the examples. The program is never linked, so
// functions and variables need no definitions.

#include <fcntl.h>
#include <poll.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <cerrno>
#include <chrono>
#include <cstdarg>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <iostream>
#include <iterator>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <unordered_map>
#include <unordered_set>
#include <utility>
#include <vector>

#include "Foundation/ZEBLogger.h"
#include "Libraries/Util/ErrorHandler/PECReport.h"
#include "Runtime/Archive/Coding.h"
#include "Runtime/Base/Private/FileDescriptor.h"
#include "Runtime/Locks/Private/LongLock.h"
#include "Runtime/Locks/Private/ThreadIdentifier.h"
#include "Runtime/Locks/RecursiveLock.h"
#include "Runtime/Objects/Weak.h"
#include "Runtime/Process/AssertionHandler.h"
#include "Runtime/Process/FileHandle.h"
#include "Shared/Logging/LUMAsyncLogger.h"
#include "Shared/Logging/LUMLogFormatter.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/LUMSyncLogger.h"
#include "Shared/ServiceRegistry/Module.h"
#include "Shared/ServiceRegistry/ServiceRegistry.h"
#include "Shared/ServiceRegistry/Source/Profiling/Private/SRLPProfilingMeasurement.h"

namespace program {

using namespace rt::literals;

// Actions.
template <class... Things>
void print(const Things&... things);
template <class... Things>
void report(const Things&... things);
template <class... Things>
void send(const Things&... things);
template <class... Things>
void show(const Things&... things);
template <class... Things>
void use(const Things&... things);
void work();

// Text and objects.
extern rt::String host, line, name, text, value;
extern std::string_view bytes, content;
extern const char* path;
extern int count;
extern rt::Ref<rt::Object> instance, object, window;
extern std::atomic<std::uint32_t> word;
extern decltype(rt::currentThreadToken()) owner_;
extern rt::Ref<rt::AssertionHandler> handler;
extern std::vector<std::byte> archive;
std::string changed(const std::string& content);

struct Frame {
  rt::String name;
};
extern std::vector<Frame> frames;

class Account : public rt::Implements<Account, rt::Object> {
 public:
  void readAgain();
};
extern rt::Ref<Account> account;

class Settings : public rt::Implements<Settings, rt::Object> {
 public:
  explicit Settings(rt::String theme);
};
extern rt::AtomicRef<Settings> settings_;

struct Delegate : rt::Protocol<Delegate> {
  virtual void didLog(const rt::String& message) = 0;

 protected:
  ~Delegate() = default;
};
extern rt::Ref<Delegate> delegate;
extern rt::Weak<Delegate> delegate_;

class Tag : public rt::Implements<Tag, rt::Object, rt::SecureCoding> {
 public:
  void encodeWithCoder(rt::KeyedArchiver& coder) const override;
};
extern rt::Ref<Tag> tag;

class Journal {
 public:
  void append(const rt::String& line);
  void write(std::string_view line);
  std::size_t size() const;

 private:
  rt::LongLock lock_;
  struct File {
    void write(std::string_view line);
  };
  File file_;
};
extern Journal* journal;

class Logger;
class Switchboard {
 public:
  void replace(Logger* logger);
  void remove(Logger* logger);
  void add(Logger* logger);

 private:
  rt::RecursiveLock lock_;
};

class Key : public rt::Implements<Key, rt::Object> {};
class ENTDoor {
 public:
  rt::Ref<Key> keyNamed(const rt::String& name);

 private:
  std::unordered_map<rt::String, rt::Ref<Key>> keys_;
};
constexpr const char* kFile = "Shared/Entrance/Source/ENTDoor";
extern const PECReportSite site;

using Result = rt::String;
void startService(const rt::Block<void(Result)>& callback);
void prepareConfigurations();

// The older logger.
extern rt::Ref<ZEBLogger> logger;
extern rt::Ref<ZEBLogWriter> counter, file, writer;
extern rt::Ref<ZEBLogFormatter> formatter;
extern ZEBLogLevel level;

// Logging.
extern rt::Ref<LUMLogMultiplexer> multiplexer;
extern rt::Ref<LUMLogMessage> message;
extern rt::Ref<LUMLogMetadata> metadata;
extern rt::Ref<LUMLogFilter> filter, filter_;
extern rt::Ref<rt::Queue> queue_;

class FileLogger : public rt::Implements<FileLogger, rt::Object, LUMAsyncLogger> {
 public:
  explicit FileLogger(const char* path);
  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override;
  rt::Ref<LUMLogFilter> filter() const override;
  rt::Ref<rt::Queue> operationQueue() const override;
  LUMLogDispatchMode dispatchModeForMessage(const LUMLogMessage& message) const override;

 private:
  rt::Ref<rt::FileHandle> file_;
};

class Terse : public rt::Implements<Terse, rt::Object, LUMLogFormatter> {
 public:
  rt::String formattedLogMessage(const LUMLogMessage& message) const override;
};

class Host {
 public:
  void attach(LUMLogMultiplexing& multiplexer);

 private:
  rt::Ref<LUMSyncLogger> terminal_;
};

// Services.
using Time = std::chrono::system_clock::time_point;

struct Clock : rt::Protocol<Clock> {
  static const rt::Ref<Clock>& shared();
  virtual Time now() const = 0;

 protected:
  ~Clock() = default;
};

class SystemClock : public rt::Implements<SystemClock, rt::Object, Clock> {
 public:
  Time now() const override;
};

struct Preferences : rt::Protocol<Preferences> {
  virtual rt::String folder() const = 0;

 protected:
  ~Preferences() = default;
};
class FilePreferences : public rt::Implements<FilePreferences, rt::Object, Preferences> {
 public:
  FilePreferences(rt::String user, rt::Ref<Clock> clock);
  rt::String folder() const override;
};

struct Importer : rt::Protocol<Importer> {
  virtual void run() = 0;

 protected:
  ~Importer() = default;
};
class CsvImporter : public rt::Implements<CsvImporter, rt::Object, Importer> {
 public:
  void run() override;
};
class JsonImporter : public rt::Implements<JsonImporter, rt::Object, Importer> {
 public:
  void run() override;
};

class View : public rt::Implements<View, rt::Object> {};

rt::Ref<rt::Object> makeClock(SRLScopeTagSet tags);

constexpr SRLAPIRegistrationData clockAPI{
    .identifier = "Clock", .instanceType = {.names = {.protocolName = "Clock"}}, .identifierLength = 5};
constexpr SRLAPIRegistrationData weatherAPI{
    .identifier = "Weather", .instanceType = {.names = {.protocolName = "Weather"}}, .identifierLength = 7};
constexpr SRLImplementationRegistrationData systemClock{
    .identifier = "SystemClock", .instanceType = {.className = "SystemClock"}, .factory = makeClock};
constexpr const SRLImplementationRegistrationData* clocks[] = {&systemClock, nullptr};
constexpr const SRLImplementationRegistrationData* weathers[] = {nullptr};
extern const SRLBindingsModuleData moduleData;

extern const SRLAPIRegistrationData* api;
extern const void* identifier;
extern rt::Ref<SRLRegistry> registry;
extern rt::Ref<SRLImplementation> implementation;
extern rt::Ref<SRLInstanceType> type;
extern SRLFactoryBlock factoryBlock;
extern SRLScopeTagSet set, tags;
extern SRLPProfilingMeasurementPartial partial;
extern std::uint64_t start, duration;

}  // namespace program
