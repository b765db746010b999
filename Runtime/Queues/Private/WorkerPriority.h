#pragma once

// The priority of the threads of the pool. For rt::detail::WorkerPool only.

namespace rt::detail {

/// Gives the calling thread the priority of utility work, or that of all other work. Returns false if the
/// system refuses. Then the thread may have too low a priority.
bool takeWorkerPriority(bool isForUtility) noexcept;

}  // namespace rt::detail
