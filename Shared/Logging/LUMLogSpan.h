#pragma once

/// A stretch of work with a name. When it ends, one message says how long it took. All that is logged
/// meanwhile refers to it.
///
///     void import(const rt::String& path) {
///       LUMLogSpan span(LUMLogLevelInfo, "import"_s, LUMLogField("path", path));
///       LUMLogAt(LUMLogLevelInfo, "reading"_s);
///     }                                                       // logs "import took 12.4 ms"
///
/// A span is a LUMLogScope of its metadata and fields, and of these properties:
///
/// - "span" is its name.
/// - "span.id" is a text of 16 hexadecimal digits. No other span has it.
/// - "span.parent" is the identifier of the span within which it began. Absent if there is none.
/// - "trace.id" is a text of 32 hexadecimal digits, the same for all spans within an outermost one.
///
/// Tasks that are put on a queue belong to the span, too. They may run after its end.
///
/// The message at the end also has "span.begin", the nanoseconds since 1970, and "span.duration", which is
/// in nanoseconds, too. If an exception has ended the span, the message says "failed after" for "took", and
/// has the property "span.failed". A logger that draws a time line needs no more than these messages.
///
/// A span whose level nobody wants when it begins has no identifiers, and logs nothing.
///
/// Threads: a span ends on the thread that made it, before the scopes that were made earlier.
///
/// Not for: measuring what takes less than a few microseconds. A span costs about as much as two messages.

#include <concepts>
#include <cstdint>
#include <source_location>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/Logging/LUMLogField.h"
#include "Shared/Logging/LUMLogLevel.h"
#include "Shared/Logging/LUMLogMetadata.h"
#include "Shared/Logging/LUMLogScope.h"

class RT_VISIBLE LUMLogSpan {
 public:
  /// A name, with the source location of the span.
  struct Name {
    Name(std::convertible_to<rt::String> auto const& name,  // NOLINT(modernize-pass-by-value): of any type
         std::source_location callSite = std::source_location::current())
        : text(name), location(callSite) {}

    rt::String text;
    std::source_location location;
  };

  /// Begins a span. `metadata` may be null. The name is not null. Throws std::bad_alloc, and what the value
  /// of a field throws.
  template <class... T>
  LUMLogSpan(LUMLogLevel level, const rt::Ref<LUMLogMetadata>& metadata, const Name& name,
             const LUMLogField<T>&... fields)
      : LUMLogSpan(level, name, LUMLogScope::withFields(metadata, fields...)) {}
  template <class... T>
  LUMLogSpan(LUMLogLevel level, const Name& name, const LUMLogField<T>&... fields)
      : LUMLogSpan(level, nullptr, name, fields...) {}

  /// Ends the span, if `end` has not done so. Drops what logging throws.
  ~LUMLogSpan();

  LUMLogSpan(const LUMLogSpan&) = delete;
  LUMLogSpan& operator=(const LUMLogSpan&) = delete;

  /// Ends the span: logs its message. The scope goes on until the object is destroyed. A second call does
  /// nothing. Throws what LUMLog throws.
  void end();

  /// Returns the identifier. Null if nobody wants the span.
  const rt::String& identifier() const noexcept { return identity_.span; }

 private:
  struct Identity {
    rt::String span;
    rt::String parent;
    rt::String trace;
  };

  LUMLogSpan(LUMLogLevel level, const Name& name, const rt::Ref<LUMLogMetadata>& metadata);
  static Identity makeIdentity(LUMLogLevel level, const rt::Ref<LUMLogMetadata>& metadata);

  const LUMLogLevel level_;
  const Name name_;
  const Identity identity_;
  const LUMLogScope scope_;
  const int exceptions_;
  const std::int64_t begin_;
  const std::uint64_t beginMonotonic_;
  bool hasEnded_ = false;
};
