#include "Runtime/Process/Private/CallStack.h"

#include <cxxabi.h>
#include <dlfcn.h>
#include <unwind.h>

#include <array>
#include <bit>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "Runtime/Process/Private/SymbolTables.h"
#include "Runtime/Process/Process.h"

namespace rt::CallStack {

namespace {

// Addresses are kept as numbers of 64 bits.
static_assert(sizeof(decltype(_Unwind_GetIP(nullptr))) == sizeof(std::uint64_t) &&
              sizeof(decltype(_Unwind_GetCFA(nullptr))) == sizeof(std::uint64_t) &&
              sizeof(void*) == sizeof(std::uint64_t));

struct Capture {
  std::span<std::uint64_t> addresses;
  std::size_t count = 0;
  std::uint64_t frame = 0;
  bool isOwnFrame = true;
};

// glibc's backtrace() does the same, but it loads a library first, and sanitizers add a frame to its result.
_Unwind_Reason_Code addFrame(_Unwind_Context* context, void* argument) noexcept {
  Capture& capture = *static_cast<Capture*>(argument);
  if (capture.isOwnFrame) {
    capture.isOwnFrame = false;
    return _URC_NO_REASON;
  }
  const std::uint64_t address = _Unwind_GetIP(context);
  const std::uint64_t frame = _Unwind_GetCFA(context);
  if (address == 0 || capture.count == capture.addresses.size()) return _URC_END_OF_STACK;
  // Wrong unwind tables may lead to the same frame again and again.
  if (capture.count > 0 && address == capture.addresses[capture.count - 1] && frame == capture.frame) {
    return _URC_END_OF_STACK;
  }
  capture.addresses[capture.count++] = address;
  capture.frame = frame;
  return _URC_NO_REASON;
}

std::string readable(const char* name) {
  int status = 0;
  const std::unique_ptr<char, decltype(&std::free)> demangled(
      abi::__cxa_demangle(name, nullptr, nullptr, &status), &std::free);
  return demangled ? demangled.get() : name;
}

const char* lastElement(const char* path) noexcept {
  const char* last = path;
  for (; *path != '\0'; ++path) {
    if (*path == '/') last = path + 1;
  }
  return last;
}

std::string hexadecimal(std::uint64_t value, int width) {
  std::array<char, 32> text{};
  std::snprintf(text.data(), text.size(), "0x%0*llx", width, static_cast<unsigned long long>(value));
  return text.data();
}

// Appends `text`, padded with blanks to `width`, and one more blank before the next column.
void appendColumn(std::string& line, std::string_view text, std::size_t width) {
  line += text;
  if (text.size() < width) line.append(width - text.size(), ' ');
  line += ' ';
}

String symbol(std::size_t number, std::uint64_t address, detail::SymbolTables& tables) {
  // If the call is the last instruction of its function, the return address lies beyond the function.
  const std::uint64_t call = address - 1;
  std::string image = "???";
  std::uint64_t imageStart = 0;
  std::string function;
  std::uint64_t functionStart = 0;
  Dl_info information{};
  if (address == 0) {
    // 0 is not a return address, so the line has only "???".
  } else if (dladdr(std::bit_cast<const void*>(call), &information) != 0 &&
             information.dli_fname != nullptr) {
    image = lastElement(information.dli_fname);
    imageStart = reinterpret_cast<std::uintptr_t>(information.dli_fbase);
    if (information.dli_sname != nullptr) {
      function = information.dli_sname;
      functionStart = reinterpret_cast<std::uintptr_t>(information.dli_saddr);
    }
  }
  if (address != 0 && function.empty()) {
    if (std::optional<detail::SymbolTables::Symbol> symbol = tables.find(call)) {
      // `dladdr` does not know the images of a statically linked program.
      if (imageStart == 0) {
        image =
            symbol->image.empty() ? std::string(Process::name().view()) : lastElement(symbol->image.c_str());
        imageStart = symbol->imageStart;
      }
      function = std::move(symbol->function);
      functionStart = symbol->functionStart;
    }
  }

  std::string line;
  appendColumn(line, std::to_string(number), 3);
  appendColumn(line, image, 35);
  line += hexadecimal(address, 16);
  if (!function.empty()) {
    line += ' ' + readable(function.c_str()) + " + " + std::to_string(address - functionStart);
  } else if (imageStart != 0) {
    line += ' ' + hexadecimal(imageStart, 0) + " + " + std::to_string(address - imageStart);
  }
  return String::fromUTF8Repaired(line);
}

}  // namespace

std::size_t capture(std::span<std::uint64_t> addresses) noexcept {
  Capture capture{addresses};
  _Unwind_Backtrace(&addFrame, &capture);
  return capture.count;
}

std::vector<String> symbols(std::span<const std::uint64_t> addresses) {
  std::vector<String> lines;
  lines.reserve(addresses.size());
  detail::SymbolTables tables;
  for (const std::uint64_t address : addresses) lines.push_back(symbol(lines.size(), address, tables));
  return lines;
}

}  // namespace rt::CallStack
