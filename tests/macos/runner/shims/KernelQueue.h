#pragma once

/// The queues of <sys/event.h>, as far as they watch files and wake their reader.
namespace KernelQueue {

/// A descriptor is about to be closed: a queue, a watched file, or something else.
void closing(int file);

}  // namespace KernelQueue
