#pragma once

/// Writes a message as a JSON object on one line. Collectors of logs read such lines as they are.
///
///     const rt::Ref<LUMLogJSON> json = LUMLogJSON::init();
///     print(json->formattedLogMessage(*message));
///
/// A line looks like this, but is not broken:
///
///     | {"Timestamp":"1784894400123456789","SeverityText":"error","SeverityNumber":17,
///     | "Body":"no route to a",
///     | "Attributes":{"bytes":42,"code.file.path":"Network.cpp","code.line.number":7,"thread.id":4711},
///     | "InstrumentationScope":{"Name":"Importer"},
///     | "Resource":{"process.pid":4711,"service.name":"com.example.host"}}
///
/// The members are those of OpenTelemetry's data model of logs, and stand in this order:
///
/// - Timestamp: nanoseconds since the start of 1970, as a string, because a number of that size loses digits
///   in many readers.
/// - SeverityText: "debug", "info", "error" or "fault", else the level as a decimal.
/// - SeverityNumber: 5, 9, 17 and 21 for these levels. 1 for level 0. Level 5 and above have 22 to 24.
/// - Body: the text, or null.
/// - Attributes: the fields, and what is listed below.
/// - TraceId, SpanId: of the innermost span (Shared/Logging/LUMLogSpan.h), if there is one. They are then no
///   attributes.
/// - InstrumentationScope: {"Name": component}, if the message has a component.
/// - Resource: the process. `service.name` is the host's identifier (Runtime/Process/Bundle.h). Without one
///   it is "unknown_service:" and the name of the program.
///
/// The attributes are sorted by the bytes of their names. A field of a name in this list replaces it:
///
///     | code.file.path, code.function.name, code.line.number    if they are known
///     | code.stacktrace                                         one frame a line, innermost first
///     | lum.category, lum.cause, lum.obfuscated_kiri_id         from the metadata, if it has them
///     | lum.queue                                               the label of the queue, if there is one
///     | thread.id
///     | thread.name                                             if the thread has one
///
/// Numbers and booleans keep their type. An integer of more than 53 bits is a string of its digits, like in
/// OTLP. So are "NaN", "Infinity" and "-Infinity". A real number always has a point or an exponent. Strings
/// are strings. Any other object is the string of its description. Properties of the metadata whose keys are
/// no strings are left out.
///
/// The line is valid JSON whatever the texts are. It is ASCII except for printable characters of the texts.
/// In a signal handler, a line that does not fit loses its attributes, its scope, its resource, and the end
/// of its text. It needs a place of 128 bytes there.
///
/// Allocates nothing unless a field has to be asked for its description.
///
/// Threads: thread-safe.
/// Fork: lines of the child have its `process.pid`.
///
/// Not for: reading JSON.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/Logging/LUMLogMessage.h"
#include "Shared/Logging/Loggers/LUMLogLine.h"
#include "Shared/Logging/Loggers/LUMLogLineFormatter.h"

class RT_VISIBLE LUMLogJSON : public rt::Implements<LUMLogJSON, rt::Object, LUMLogLineFormatter> {
 public:
  /// Makes a formatter for the host's present identifier. Throws std::bad_alloc.
  static rt::Ref<LUMLogJSON> init();

  void appendLine(LUMLogLine& line, const LUMLogMessage& message) const override;

 protected:
  explicit LUMLogJSON(const rt::String& serviceName);

 private:
  void appendWhole(LUMLogLine& line, const LUMLogMessage& message) const;

  // As it stands between the quotes of a JSON string.
  const rt::String serviceName_;
};
