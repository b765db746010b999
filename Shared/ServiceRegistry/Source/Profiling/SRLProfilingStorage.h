#pragma once

/// Stores the results of profiling in memory.
///
///     const rt::Ref<SRLProfilingStorage>& storage = SRLProfilingStorage::sharedInstance();
///     std::cout << storage->serviceInitializationEvents()->count() << " services were made.\n";
///
/// The storage grows with every instance that is made for a scope, and with every implementation that makes a
/// new instance at every request. Nothing is ever removed.
///
/// Threads: any thread may use it.
///
/// Not for: several storages in a program. Profiling uses the shared one only.

#include <cstdint>
#include <unordered_map>
#include <vector>

#include "Runtime/Base/ThreadSafety.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Values/Array.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLPServiceInitializationEvent.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLPServiceInitializationNewInstanceEvent.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLProfilingStorageProtocol.h"

class RT_VISIBLE SRLProfilingStorage final
    : public rt::Implements<SRLProfilingStorage, rt::Object, SRLProfilingStorageProtocol> {
 public:
  /// Returns the storage that profiling uses. It is made by the first call and never destroyed.
  static const rt::Ref<SRLProfilingStorage>& sharedInstance();

  /// Returns an empty storage. Throws std::bad_alloc.
  static rt::Ref<SRLProfilingStorage> init();

  void storeServiceInitializationEvent(const rt::Ref<SRLPServiceInitializationEvent>& event) override;
  void storeServiceInitializationNewInstanceEventWithAPIDescription(const rt::String& apiDescription,
                                                                    const rt::String& implDescription,
                                                                    std::uint64_t durationNs) override;
  rt::Ref<rt::Array> serviceInitializationEvents() const override;
  rt::Ref<rt::Array> serviceInitializationNewInstanceEvents() const override;

 private:
  SRLProfilingStorage() = default;

  std::vector<rt::Ref<SRLPServiceInitializationEvent>> events_ RT_GUARDED_BY(eventsLock_);
  mutable rt::UnfairLock eventsLock_;
  std::unordered_map<rt::String, rt::Ref<SRLPServiceInitializationNewInstanceEvent>>
      implDescriptionToNewInstanceEvent_ RT_GUARDED_BY(implDescriptionToNewInstanceEventLock_);
  mutable rt::UnfairLock implDescriptionToNewInstanceEventLock_;
};
