#pragma once

/// Lets the calling thread meet the file system as its caller, the real user and group of the process, in all
/// that follows: what it writes, and what `CallersDirectory.h` offers.
///
/// On Linux the caller may then write in any directory: new files belong to the caller, and of all
/// capabilities only CAP_DAC_OVERRIDE is left, effective and permitted. There is no way back. Changes nothing
/// in three cases: CAP_CHOWN is not effective; CAP_DAC_OVERRIDE is not permitted; the system refuses a step,
/// as a filter of system calls may.
///
/// On macOS the effective user and group become the real ones, and the saved user stays root. Changes nothing
/// where the effective user is not root.
///
/// A caller whom nobody disturbs gets the same results with it and without. Changes `errno`. Thread-safe on
/// Linux, where the real, effective and saved identifiers of the process stay; not on macOS.
void takeOnCallersIdentity();
