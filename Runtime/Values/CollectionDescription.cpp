#include "Runtime/Values/CollectionDescription.h"

#include <algorithm>
#include <cstddef>
#include <functional>
#include <string_view>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/StringBuilder.h"
#include "Runtime/Values/Number.h"

namespace rt::detail {

namespace {

constexpr std::string_view kIndentation = "    ";

bool isWord(std::string_view text) {
  return !text.empty() && std::ranges::all_of(text, [](char c) {
    return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || c == '_' ||
           c == '.' || c == '/' || c == '-';
  });
}

void appendQuoted(StringBuilder& builder, std::string_view text) {
  constexpr std::string_view kEscaped = "\"\\\n\r\t";
  constexpr std::string_view kLetters = "\"\\nrt";
  constexpr std::string_view kDigits = "0123456789ABCDEF";
  builder.append('"');
  for (const char c : text) {
    if (const std::size_t i = kEscaped.find(c); i != std::string_view::npos) {
      builder.append('\\');
      builder.append(kLetters[i]);
    } else if (const auto byte = static_cast<unsigned char>(c); byte < 0x20 || byte == 0x7F) {
      builder.append("\\x");
      builder.append(kDigits[byte >> 4]);
      builder.append(kDigits[byte & 0xF]);
    } else {
      builder.append(c);
    }
  }
  builder.append('"');
}

void appendIndented(StringBuilder& builder, std::string_view text) {
  for (std::size_t lineEnd = text.find('\n'); lineEnd != std::string_view::npos; lineEnd = text.find('\n')) {
    builder.append(text.substr(0, lineEnd + 1));
    builder.append(kIndentation);
    text.remove_prefix(lineEnd + 1);
  }
  builder.append(text);
}

// Appends `object`, whose description is `description`.
void append(StringBuilder& builder, const Object& object, const String& description) {
  if (object.isKindOf(classInfo<StringObject>()) && !isWord(description)) {
    appendQuoted(builder, description);
  } else {
    appendIndented(builder, description ? description.view() : "(null)");
  }
}

void append(StringBuilder& builder, const Object& object) {
  append(builder, object, object.description());
}

// A key and what its order depends on.
struct OrderedEntry {
  explicit OrderedEntry(const DescribedEntry& described)
      : entry(described),
        number(cast<Number>(described.key)),
        isString(described.key->isKindOf(classInfo<StringObject>())),
        description(described.key->description()) {}

  bool operator<(const OrderedEntry& other) const {
    if (number != nullptr && other.number != nullptr) return number->compare(*other.number) < 0;
    if (number != nullptr || other.number != nullptr) return number != nullptr;
    if (isString != other.isString) return isString;
    return description < other.description;
  }

  DescribedEntry entry;
  const Number* number;
  bool isString;
  String description;
};

std::vector<OrderedEntry> ordered(std::span<const DescribedEntry> entries) {
  std::vector<OrderedEntry> result(entries.begin(), entries.end());
  std::ranges::sort(result, std::less());
  return result;
}

}  // namespace

String describeArray(std::span<const Ref<Object>> elements) {
  StringBuilder builder;
  builder.append('(');
  std::string_view separator = "\n";
  for (const Ref<Object>& element : elements) {
    builder.append(separator);
    builder.append(kIndentation);
    append(builder, *element);
    separator = ",\n";
  }
  builder.append("\n)");
  return builder.string();
}

String describeSet(std::span<const DescribedEntry> elements) {
  StringBuilder builder;
  builder.append("{(");
  std::string_view separator = "\n";
  for (const OrderedEntry& element : ordered(elements)) {
    builder.append(separator);
    builder.append(kIndentation);
    append(builder, *element.entry.key, element.description);
    separator = ",\n";
  }
  builder.append("\n)}");
  return builder.string();
}

String describeDictionary(std::span<const DescribedEntry> entries) {
  StringBuilder builder;
  builder.append("{\n");
  for (const OrderedEntry& each : ordered(entries)) {
    builder.append(kIndentation);
    append(builder, *each.entry.key, each.description);
    builder.append(" = ");
    append(builder, *each.entry.value);
    builder.append(";\n");
  }
  builder.append('}');
  return builder.string();
}

}  // namespace rt::detail
