#include "Runtime/CallStack.h"

#include <cxxabi.h>
#include <dlfcn.h>
#include <unwind.h>

#include <array>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <string>
#include <string_view>

namespace rt::CallStack {

namespace {

struct Capture {
  std::span<std::uint64_t> addresses;
  std::size_t count = 0;
  bool isOwnFrame = true;
};

// Not glibc's backtrace(), which does the same after loading a library, and which the sanitizers put a
// frame of their own before.
_Unwind_Reason_Code addFrame(_Unwind_Context* context, void* argument) noexcept {
  Capture& capture = *static_cast<Capture*>(argument);
  if (capture.isOwnFrame) {
    capture.isOwnFrame = false;
    return _URC_NO_REASON;
  }
  const std::uint64_t address = _Unwind_GetIP(context);
  if (address == 0 || capture.count == capture.addresses.size()) return _URC_END_OF_STACK;
  capture.addresses[capture.count++] = address;
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

// Appends `text`, blanks up to `width`, and one that parts it from the next column.
void appendColumn(std::string& line, std::string_view text, std::size_t width) {
  line += text;
  if (text.size() < width) line.append(width - text.size(), ' ');
  line += ' ';
}

String symbol(std::size_t number, std::uint64_t address) {
  Dl_info information{};
  // A return address lies behind the call, which may have been the last thing in its function.
  const void* const call = reinterpret_cast<const void*>(address - 1);
  const bool isKnown = address != 0 && dladdr(call, &information) != 0 && information.dli_fname != nullptr;
  const char* const image = isKnown ? lastElement(information.dli_fname) : "???";

  std::string line;
  appendColumn(line, std::to_string(number), 3);
  appendColumn(line, image, 35);
  line += hexadecimal(address, 16);
  if (isKnown) {
    const bool isNamed = information.dli_sname != nullptr;
    const void* const start = isNamed ? information.dli_saddr : information.dli_fbase;
    line += ' ';
    line += isNamed ? readable(information.dli_sname)
                    : hexadecimal(reinterpret_cast<std::uintptr_t>(information.dli_fbase), 0);
    line += " + " + std::to_string(address - reinterpret_cast<std::uintptr_t>(start));
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
  for (const std::uint64_t address : addresses) lines.push_back(symbol(lines.size(), address));
  return lines;
}

}  // namespace rt::CallStack
