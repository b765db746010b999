#pragma once

/// Writes what loggers still hold when the program crashes.
///
///     int main() {
///       LUMLogCrash::install();
///       const auto logger =
///       LUMBoundedLogger::initWithLogger(LUMFileLogger::initWithPath("/var/log/host.log"_s));
///       LUMLogMultiplexer::sharedInstance()->addSyncLogger(logger);
///       ...
///     }
///
/// It handles SIGSEGV, SIGBUS, SIGILL, SIGFPE, SIGABRT, SIGSYS, SIGTRAP and std::terminate. After one of
/// them, each LUMBoundedLogger writes the messages that wait, and each LUMRingLogger hands on those that it
/// keeps. Both use LUMLogOutput::logInSignalHandler of their target. Then each target gets a message about
/// the signal, of level fault and component "LUMLogCrash":
///
///     | SIGSEGV at address 0x10 in thread 4711
///     | SIGABRT from process 12 in thread 4711
///     | std::terminate in thread 4711: an exception of type St13runtime_error: no such file
///
/// `std::terminate` has a line of its own, before that of the SIGABRT which it usually ends with.
///
/// If there is no target, the line goes to standard error. It says how many messages could not be written:
/// those whose target is no LUMLogOutput, and those that full queues had dropped without a report.
///
/// Then the signal does its work. The action that it had before `install` is restored. An instruction that
/// failed is executed again, and any other signal is sent again. So an earlier handler runs, a core has the
/// same place, and the process ends with the same status. If an earlier handler lets the program go on, later
/// signals of that kind find that handler alone. An earlier terminate handler is called, too.
///
/// Each message that waits is written once. The message that was being written at that moment is written at
/// least once, and a LUMBoundedLogger waits a tenth of a second for it. A message whose `LUMLogAt` has not
/// returned may be lost.
///
/// - If several threads crash, the first one writes. Others wait for two seconds at most.
/// - A crash while messages are written ends the program by its signal. The remaining messages are lost.
/// - Messages that a ring is handing on at that moment are lost.
/// - An output that blocks for ever keeps the program from ending.
///
/// Stacks: a handler needs a stack of its own after an overflow. `install` gives one to the calling thread,
/// unless that has one. On other threads, an overflow ends the program without writing. Call `install` on
/// those threads, too.
///
/// Fork: the child has the handlers.
///
/// Not for: signals that ask the program to end, such as SIGTERM; recovering from a crash.

#include "Runtime/Base/Visibility.h"

namespace LUMLogCrash {

/// Installs the handlers, and gives the calling thread a stack for them. Does nothing that has been done
/// already. A signal that the program ignores stays ignored. Throws std::bad_alloc.
///
/// Threads: any thread may call this at any time, also before `main`.
RT_VISIBLE void install();

}  // namespace LUMLogCrash
