#pragma once

/// Whether this build measures how long services take to be made.
///
///     bool SRLPProfilingSwitch() { return true; }       // in a source file of the program: it does
///
/// The library's own answers what it was configured with, MOUNT_POINT_PROFILING, which is off unless it is
/// set. A program that defines the function itself gets its own answer instead.
///
/// Not for: asking whether profiling is on (SRLPProfilingEnabled.h). The registry asks this function once in
/// a process, on whichever thread needs to know first.

bool SRLPProfilingSwitch();
