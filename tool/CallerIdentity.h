#pragma once

/// Takes on the caller's identity: from now on the calling thread acts as its caller towards the file system.
/// The caller is the real user and group of the process. This covers everything that the thread writes, and
/// the functions of `CallersDirectory.h`.
///
/// On Linux the caller may then write in any directory, and new files belong to the caller. CAP_DAC_OVERRIDE
/// is the only capability left, both effective and permitted. There is no way back. Nothing changes in three
/// cases:
///
/// - CAP_CHOWN is not effective.
/// - CAP_DAC_OVERRIDE is not permitted.
/// - The system refuses a step, as a filter of system calls may.
///
/// On macOS the effective user and group become the real ones, and the saved user stays root. The functions
/// of `CallersDirectory.h` give up the saved user for good. Nothing changes if the effective user is not
/// root.
///
/// If nothing else interferes, the caller gets the same results with and without this call. Changes `errno`.
///
/// Threads: thread-safe on Linux, where the process keeps its real, effective and saved identifiers. Not
/// thread-safe on macOS.
void takeOnCallersIdentity();
