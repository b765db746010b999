#pragma once

#include <cstdint>

/// The name of a thread's port, by which locks know their owner.
using ThreadPort = std::uint32_t;
ThreadPort ownThreadPort();
