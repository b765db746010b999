#pragma once

/// The front door of the runtime: objects, text, locks, queues and services of the system.
///
///     #include "Runtime/Runtime.h"
///
///     using namespace rt::literals;
///
///     rt::Ref<rt::Queue> queue = rt::make<rt::Queue>("Journal"_s);
///     queue->async([] { rt::FileHandle::standardError()->writeLine("written by a task"); });
///     queue->barrierSync();
///
/// It includes every public header of the library. To parse less, include single headers instead.
///
/// Not for: the headers of this project, which include what they use.

// IWYU pragma: begin_exports
#include "Runtime/Archive/Coding.h"
#include "Runtime/Archive/KeyedArchiver.h"
#include "Runtime/Archive/KeyedUnarchiver.h"
#include "Runtime/Base/ThreadSafety.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Defaults/UserDefaults.h"
#include "Runtime/Locks/RecursiveLock.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Objects/Block.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/ClassInfo.h"
#include "Runtime/Objects/ClassMethod.h"
#include "Runtime/Objects/Exception.h"
#include "Runtime/Objects/LoadHook.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Objects/StringBuilder.h"
#include "Runtime/Objects/StringObject.h"
#include "Runtime/Objects/Weak.h"
#include "Runtime/Process/AssertionHandler.h"
#include "Runtime/Process/Bundle.h"
#include "Runtime/Process/FileHandle.h"
#include "Runtime/Process/Process.h"
#include "Runtime/Process/Thread.h"
#include "Runtime/Queues/MainQueue.h"
#include "Runtime/Queues/QualityOfService.h"
#include "Runtime/Queues/Queue.h"
#include "Runtime/SystemLog/SystemLog.h"
#include "Runtime/Text/Description.h"
#include "Runtime/Text/Format.h"
#include "Runtime/Text/FormatString.h"
#include "Runtime/Values/Array.h"
#include "Runtime/Values/Dictionary.h"
#include "Runtime/Values/Number.h"
#include "Runtime/Values/Set.h"
// IWYU pragma: end_exports
