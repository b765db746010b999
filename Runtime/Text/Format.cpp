#include "Runtime/Text/Format.h"

#include <algorithm>
#include <array>
#include <bit>
#include <charconv>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <cwchar>
#include <new>
#include <optional>

#include "Runtime/Base/UTF8.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/StringBuilder.h"

// `writeAsC` builds formats for snprintf at run time.
#pragma GCC diagnostic ignored "-Wformat-nonliteral"

namespace rt {

namespace {

using Length = FormatDirective::Length;

constexpr std::string_view kNullText = "(null)";

// All 64-bit integers are read as `long`, and wide characters as `char32_t`.
static_assert(sizeof(long) == 8 && sizeof(long long) == 8 && sizeof(void*) == 8 && sizeof(wchar_t) == 4);

union Value {
  int integer;
  std::int64_t wide;
  double real;
  long double longReal;
  const void* pointer;
};

// Reads the arguments in order, from a copy of the caller's list.
class ArgumentList {
 public:
  explicit ArgumentList(std::va_list list) noexcept { va_copy(list_, list); }
  ArgumentList(const ArgumentList&) = delete;
  ArgumentList& operator=(const ArgumentList&) = delete;
  ~ArgumentList() { va_end(list_); }

  // Returns the next argument. The reference is valid until the next call.
  const Value& next(FormatArgument type) noexcept {
    switch (type) {
      case FormatArgument::kNone:
        break;
      case FormatArgument::kInt:
        value_.integer = va_arg(list_, int);
        break;
      case FormatArgument::kLong:
        value_.wide = va_arg(list_, long);
        break;
      case FormatArgument::kDouble:
        value_.real = va_arg(list_, double);
        break;
      case FormatArgument::kLongDouble:
        value_.longReal = va_arg(list_, long double);
        break;
      case FormatArgument::kPointer:
        value_.pointer = va_arg(list_, const void*);
        break;
    }
    return value_;
  }

 private:
  std::va_list list_;
  Value value_{};
};

// The arguments of a format that goes by positions. The constructor first collects their types from all
// directives, then reads them all: a list can only be read in order, and by type.
class PositionalArguments {
 public:
  PositionalArguments(std::string_view format, std::size_t start, ArgumentList& list) noexcept {
    while ((start = format.find('%', start)) != std::string_view::npos) {
      FormatDirective directive;
      const std::size_t length = parseFormatDirective(format, start, directive);
      if (length != 0 && !directive.takesNext()) {
        visit(directive, [this](int position, FormatArgument type) {
          FormatArgument& known = types_[static_cast<std::size_t>(position) - 1];
          if (known == FormatArgument::kNone) known = type;
        });
      }
      start += std::max<std::size_t>(length, 1);
    }
    while (count_ < types_.size() && types_[count_] != FormatArgument::kNone) {
      values_[count_] = list.next(types_[count_]);
      ++count_;
    }
  }

  // Returns whether all arguments of the directive are known and have the types that it takes.
  bool suit(const FormatDirective& directive) const noexcept {
    bool result = !directive.takesNext();
    if (result) {
      visit(directive, [&](int position, FormatArgument type) {
        const std::size_t i = static_cast<std::size_t>(position) - 1;
        result = result && i < count_ && types_[i] == type;
      });
    }
    return result;
  }

  // Returns the argument at `position`. Precondition: `suit` is true for the directive that names it.
  const Value& at(int position) const noexcept { return values_[static_cast<std::size_t>(position) - 1]; }

 private:
  static void visit(const FormatDirective& directive, auto&& each) {
    if (directive.width.isArgument) each(directive.width.position, FormatArgument::kInt);
    if (directive.precision.isArgument) each(directive.precision.position, FormatArgument::kInt);
    if (directive.argument() != FormatArgument::kNone) each(directive.position, directive.argument());
  }

  std::array<FormatArgument, FormatDirective::kMaximumPosition> types_{};
  std::array<Value, FormatDirective::kMaximumPosition> values_;
  std::size_t count_ = 0;
};

std::int64_t signedValue(Length length, const Value& value) noexcept {
  switch (length) {
    case Length::kByte:
      return static_cast<signed char>(value.integer);
    case Length::kShort:
      return static_cast<short>(value.integer);
    case Length::kDefault:
      return value.integer;
    default:
      return value.wide;
  }
}

std::uint64_t unsignedValue(Length length, const Value& value) noexcept {
  switch (length) {
    case Length::kByte:
      return static_cast<unsigned char>(value.integer);
    case Length::kShort:
      return static_cast<unsigned short>(value.integer);
    case Length::kDefault:
      return static_cast<unsigned>(value.integer);
    default:
      return static_cast<std::uint64_t>(value.wide);
  }
}

// Returns `text` without an incomplete character at its end.
std::string_view withoutCutCharacter(std::string_view text) noexcept {
  for (std::size_t i = 1; i < kMaximumUTF8Length && i <= text.size(); ++i) {
    if (nextUTF8(text.substr(text.size() - i)).isCutShort) return text.substr(0, text.size() - i);
  }
  return text;
}

class Formatter {
 public:
  Formatter(std::string_view format, std::va_list arguments) noexcept : format_(format), list_(arguments) {}

  String run();

 private:
  std::size_t writeLiteral(std::size_t start);
  bool writeSimple(char conversion);
  bool canTakeArguments(const FormatDirective& directive, std::size_t start);
  void write(FormatDirective& directive);
  void writeSigned(const FormatDirective& directive, std::int64_t value);
  void writeUnsigned(const FormatDirective& directive, std::uint64_t value);
  void writeCharacter(const FormatDirective& directive, int value);
  void writePointer(const FormatDirective& directive, const void* pointer);
  void writeObject(const FormatDirective& directive, const Object* object);
  void writeBytes(const FormatDirective& directive, const char* text);
  void writeWide(const FormatDirective& directive, const wchar_t* text);
  void writeText(const FormatDirective& directive, std::string_view text);
  std::string_view cut(std::string_view text) const noexcept;
  void padBefore(const FormatDirective& directive, std::size_t length);
  void padAfter(const FormatDirective& directive, std::size_t length);

  template <class T>
  void writeDigits(T value, int base);
  template <class T>
  void writeAsC(const FormatDirective& directive, std::string_view length, T value);

  bool isPlain(const FormatDirective& directive) const noexcept {
    return directive.flags == 0 && width_ == 0 && precision_ < 0;
  }
  const Value& argument(int position, FormatArgument type) noexcept {
    return position != 0 && positional_ ? positional_->at(position) : list_.next(type);
  }
  int number(const FormatDirective::Number& number) noexcept {
    return number.isArgument ? argument(number.position, FormatArgument::kInt).integer : number.value;
  }

  const std::string_view format_;
  ArgumentList list_;
  // Whether a directive has decided if the format goes by positions.
  bool isDecided_ = false;
  std::optional<PositionalArguments> positional_;
  // The width and precision of the current directive, whether the format or an argument gives them.
  int width_ = 0;
  int precision_ = FormatDirective::kNone;
  StringBuilder out_;
};

String Formatter::run() {
  for (std::size_t i = 0;;) {
    const std::size_t percent = writeLiteral(i);
    if (percent == format_.size()) return out_.string();
    if (percent + 1 < format_.size() && writeSimple(format_[percent + 1])) {
      i = percent + 2;
      continue;
    }
    FormatDirective directive;
    const std::size_t length = parseFormatDirective(format_, percent, directive);
    if (length != 0 && canTakeArguments(directive, percent)) {
      write(directive);
      i = percent + length;
    } else {
      out_.append('%');
      i = percent + 1;
    }
  }
}

// Copies the text from `start` to the next '%' or to the end, and returns where it stopped. It goes word by
// word, since most literal text is short.
std::size_t Formatter::writeLiteral(std::size_t start) {
  constexpr std::uint64_t kEach = 0x0101010101010101U;
  constexpr std::uint64_t kLow = 0x7F * kEach;
  constexpr std::size_t kSize = sizeof kEach;
  std::size_t i = start;
  for (; format_.size() - i >= kSize; i += kSize) {
    std::uint64_t word = 0;
    std::memcpy(&word, format_.data() + i, kSize);
    std::memcpy(out_.prepare(kSize), &word, kSize);
    // `found` has the highest bit of each byte that is a '%'. The first byte of the text is the lowest.
    const std::uint64_t other = word ^ ('%' * kEach);
    if (const std::uint64_t found = ~(((other & kLow) + kLow) | other | kLow); found != 0) {
      const auto count = static_cast<std::size_t>(std::countr_zero(found)) / 8;
      out_.commit(count);
      return i + count;
    }
    out_.commit(kSize);
  }
  for (; i < format_.size() && format_[i] != '%'; ++i) out_.append(format_[i]);
  return i;
}

// Writes "%@", "%s" or "%d" with nothing between the two characters, and returns true. Most directives are of
// this sort. Returns false without effect for other directives, and if the format goes by positions.
bool Formatter::writeSimple(char conversion) {
  constexpr FormatDirective kPlain;
  if (positional_ || (conversion != '@' && conversion != 's' && conversion != 'd')) return false;
  isDecided_ = true;
  width_ = 0;
  precision_ = FormatDirective::kNone;
  if (conversion == 'd') {
    writeDigits(std::int64_t{list_.next(FormatArgument::kInt).integer}, 10);
  } else if (const void* pointer = list_.next(FormatArgument::kPointer).pointer; conversion == 's') {
    out_.append(pointer != nullptr ? std::string_view(static_cast<const char*>(pointer)) : kNullText);
  } else {
    writeObject(kPlain, static_cast<const Object*>(pointer));
  }
  return true;
}

bool Formatter::canTakeArguments(const FormatDirective& directive, std::size_t start) {
  const bool hasPositions = directive.hasPositions();
  if (!isDecided_ && (hasPositions || directive.takesNext())) {
    isDecided_ = true;
    if (hasPositions) positional_.emplace(format_, start, list_);
  }
  return positional_ ? positional_->suit(directive) : !hasPositions;
}

void Formatter::write(FormatDirective& directive) {
  const int width = number(directive.width);
  if (directive.width.isArgument && width < 0) directive.flags |= FormatDirective::kLeft;
  width_ = width == FormatDirective::kNone && !directive.width.isArgument
               ? 0
               : std::abs(std::clamp(width, -kMaximumFieldWidth, kMaximumFieldWidth));
  precision_ = number(directive.precision);

  const FormatArgument type = directive.argument();
  const Value& value = argument(directive.position, type);
  switch (directive.conversion) {
    case 'd':
    case 'i':
      writeSigned(directive, signedValue(directive.length, value));
      break;
    case 'u':
    case 'o':
    case 'x':
    case 'X':
      writeUnsigned(directive, unsignedValue(directive.length, value));
      break;
    case 'c':
    case 'C':
      writeCharacter(directive, value.integer);
      break;
    case 's':
    case 'S':
      if (directive.isWide()) {
        writeWide(directive, static_cast<const wchar_t*>(value.pointer));
      } else {
        writeBytes(directive, static_cast<const char*>(value.pointer));
      }
      break;
    case 'p':
      writePointer(directive, value.pointer);
      break;
    case '@':
      writeObject(directive, static_cast<const Object*>(value.pointer));
      break;
    case 'n':
      break;
    case '%':
      out_.append('%');
      break;
    default:
      if (type == FormatArgument::kLongDouble) {
        writeAsC(directive, "L", value.longReal);
      } else {
        writeAsC(directive, "", value.real);
      }
  }
}

template <class T>
void Formatter::writeDigits(T value, int base) {
  constexpr std::size_t kRoom = 24;  // 64 bits in octal and a sign fit
  char* first = out_.prepare(kRoom);
  out_.commit(static_cast<std::size_t>(std::to_chars(first, first + kRoom, value, base).ptr - first));
}

template <class T>
void Formatter::writeAsC(const FormatDirective& directive, std::string_view length, T value) {
  char specification[16];
  char* next = specification;
  *next++ = '%';
  for (std::size_t i = 0; i < 6; ++i) {
    if ((directive.flags & (1U << i)) != 0) *next++ = "-+ #0'"[i];
  }
  next = std::ranges::copy(std::string_view("*.*"), next).out;
  next = std::ranges::copy(length, next).out;
  *next++ = directive.conversion;
  *next = '\0';

  const int precision = std::min(precision_, kMaximumFieldWidth);
  for (std::size_t room = std::max<std::size_t>(out_.available(), 64);;) {
    const int written = std::snprintf(out_.prepare(room), room, specification, width_, precision, value);
    if (written < 0) throw std::bad_alloc();
    if (static_cast<std::size_t>(written) < room) {
      out_.commit(static_cast<std::size_t>(written));
      return;
    }
    room = static_cast<std::size_t>(written) + 1;
  }
}

void Formatter::writeSigned(const FormatDirective& directive, std::int64_t value) {
  if (isPlain(directive)) {
    writeDigits(value, 10);
  } else {
    writeAsC(directive, "ll", static_cast<long long>(value));
  }
}

void Formatter::writeUnsigned(const FormatDirective& directive, std::uint64_t value) {
  if (isPlain(directive) && directive.conversion != 'X') {
    const int base = directive.conversion == 'x' ? 16 : 10;
    writeDigits(value, directive.conversion == 'o' ? 8 : base);
  } else {
    writeAsC(directive, "ll", static_cast<unsigned long long>(value));
  }
}

void Formatter::writeCharacter(const FormatDirective& directive, int value) {
  char bytes[kMaximumUTF8Length] = {static_cast<char>(value)};
  const std::size_t length = directive.isWide() ? encodeUTF8(static_cast<char32_t>(value), bytes) : 1;
  writeText(directive, {bytes, length});
}

void Formatter::writePointer(const FormatDirective& directive, const void* pointer) {
  char text[32];
  // snprintf decides how a null pointer is printed.
  const int length = std::snprintf(text, sizeof text, "%p", pointer);
  writeText(directive, {text, static_cast<std::size_t>(length)});
}

void Formatter::writeObject(const FormatDirective& directive, const Object* object) {
  if (object == nullptr) {
    writeText(directive, cut(kNullText));
  } else if (object->isMemberOf(classInfo<StringObject>())) {
    // Most objects are strings. `description()` would retain and release them.
    writeText(directive, cut(static_cast<const StringObject*>(object)->view()));
  } else {
    const String description = object->description();
    writeText(directive, cut(description ? description.view() : kNullText));
  }
}

void Formatter::writeBytes(const FormatDirective& directive, const char* text) {
  if (text == nullptr) {
    writeText(directive, cut(kNullText));
  } else if (precision_ < 0) {
    writeText(directive, text);
  } else {
    // The text need not end with NUL if it is at least as long as the precision.
    writeText(directive, cut({text, ::strnlen(text, static_cast<std::size_t>(precision_))}));
  }
}

void Formatter::writeWide(const FormatDirective& directive, const wchar_t* text) {
  if (text == nullptr) {
    writeText(directive, cut(kNullText));
    return;
  }
  const auto limit = precision_ < 0 ? SIZE_MAX : static_cast<std::size_t>(precision_);
  char bytes[kMaximumUTF8Length];
  std::size_t length = 0;
  const wchar_t* end = text;
  while (length < limit && *end != L'\0') {
    const std::size_t added = encodeUTF8(static_cast<char32_t>(*end), bytes);
    if (added > limit - length) break;
    length += added;
    ++end;
  }
  padBefore(directive, length);
  for (; text != end; ++text) out_.append({bytes, encodeUTF8(static_cast<char32_t>(*text), bytes)});
  padAfter(directive, length);
}

void Formatter::writeText(const FormatDirective& directive, std::string_view text) {
  padBefore(directive, text.size());
  out_.append(text);
  padAfter(directive, text.size());
}

std::string_view Formatter::cut(std::string_view text) const noexcept {
  if (precision_ < 0 || text.size() < static_cast<std::size_t>(precision_)) return text;
  return withoutCutCharacter(text.substr(0, static_cast<std::size_t>(precision_)));
}

void Formatter::padBefore(const FormatDirective& directive, std::size_t length) {
  const auto width = static_cast<std::size_t>(width_);
  if ((directive.flags & FormatDirective::kLeft) == 0 && width > length) out_.append(width - length, ' ');
}

void Formatter::padAfter(const FormatDirective& directive, std::size_t length) {
  const auto width = static_cast<std::size_t>(width_);
  if ((directive.flags & FormatDirective::kLeft) != 0 && width > length) out_.append(width - length, ' ');
}

}  // namespace

String formatV(const String& format, std::va_list arguments) {
  return format ? Formatter(format.view(), arguments).run() : String();
}

String formatV(const char* format, std::va_list arguments) {
  return format != nullptr ? Formatter(format, arguments).run() : String();
}

String detail::formatVariadic(const char* format, std::size_t length, ...) {
  std::va_list arguments;
  va_start(arguments, length);
  Formatter formatter({format, length}, arguments);
  va_end(arguments);
  return formatter.run();
}

}  // namespace rt
