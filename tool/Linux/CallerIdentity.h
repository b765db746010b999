#pragma once

/// Lets the calling thread meet the file system as its caller, the real user and group of the process, who
/// may write in any directory: new files belong to the caller, and of all capabilities only CAP_DAC_OVERRIDE
/// is left, effective and permitted. There is no way back.
///
/// Changes nothing where the thread has no CAP_CHOWN, without which nothing can be given away, where
/// CAP_DAC_OVERRIDE is not permitted, and where the system refuses a part of it, as a filter of system calls
/// may. So a caller whom nobody disturbs gets the same results with it and without.
///
/// Thread-safe; changes `errno`. The process's real, effective and saved identifiers stay.
void takeOnCallersIdentity();
