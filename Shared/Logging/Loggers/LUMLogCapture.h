#pragma once

/// Keeps what is logged while it lives, for the tests of a host.
///
///     const LUMLogCapture capture;
///     LUMLogAt(LUMLogLevelError, "no route to %@"_s, host);
///     print(capture.messages().size());                       // 1
///
/// Shared/Logging/Loggers/Testing/LUMLogMatchers.h has matchers of GoogleTest for the messages.
///
/// It is one more logger of the shared multiplexer. So the filters of the multiplexer decide first, and the
/// other loggers get the messages too. While it lives, messages of all levels are wanted: a line that costs
/// nothing otherwise (Shared/Logging/LUMLogInterest.h) is made, and its arguments are described.
///
/// Several may live at once. Each keeps all messages.
///
/// Threads: any thread may log while it lives. Messages of one thread are kept in their order.
///
/// Not for: programs that log for long, since nothing is forgotten before the end.

#include <cstdint>
#include <vector>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/Logging/LUMLogMessage.h"

class RT_VISIBLE LUMLogCapture {
 public:
  /// Whose messages to keep: those of all threads, or those that the thread makes that made this object.
  enum class Threads : std::uint8_t { kAll, kCalling };

  /// Begins to keep messages. Throws std::bad_alloc.
  explicit LUMLogCapture(Threads threads = Threads::kAll);
  LUMLogCapture(const LUMLogCapture&) = delete;
  LUMLogCapture& operator=(const LUMLogCapture&) = delete;

  /// Ends it. Terminates the program if there is no memory to change the multiplexer's loggers.
  ~LUMLogCapture();

  /// Returns the messages so far. Throws std::bad_alloc.
  std::vector<rt::Ref<LUMLogMessage>> messages() const;

  /// Returns the messages so far and forgets them.
  std::vector<rt::Ref<LUMLogMessage>> takeMessages();

 private:
  class Logger;
  const rt::Ref<Logger> logger_;
};
