#pragma once

/// Makes the calling thread act towards the file system as its caller, from now on. The caller is the real
/// user and group of the process. The change applies to everything that the thread writes, and to the
/// functions of `CallersDirectory.h`.
///
/// On Linux the caller may then write in any directory, and new files belong to the caller. CAP_DAC_OVERRIDE
/// is the only capability left, both effective and permitted. There is no way back. Nothing changes in three
/// cases:
///
/// - CAP_CHOWN is not effective.
/// - CAP_DAC_OVERRIDE is not permitted.
/// - The system refuses a step, as a filter of system calls may.
///
/// On macOS the effective user and group become the real ones, and the saved user stays root. Nothing changes
/// if the effective user is not root.
///
/// If no other process interferes, results are the same with and without this call. Changes `errno`.
///
/// Threads: thread-safe on Linux, where the process keeps its real, effective and saved identifiers. Not
/// thread-safe on macOS.
void takeOnCallersIdentity();
