#pragma once

/// The function that decides whether a program measures how long services take to be made.
///
///     bool SRLPProfilingSwitch() { return true; }       // in a source file of the program: it does
///
/// The library's own definition returns the value of the CMake option MOUNT_POINT_PROFILING, which is off by
/// default. A program can define the function itself and so replace that definition.
///
/// Not for: asking whether profiling is on. The registry calls this function once per process, on the first
/// thread that needs the answer.

bool SRLPProfilingSwitch();
