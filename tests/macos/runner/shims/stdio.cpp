// Streams are those of the C library. They are only used through functions.

#include <fcntl.h>

#include <cstdarg>
#include <cstdio>
#include <cwchar>

#include "tests/macos/runner/Shims.h"
#include "tests/macos/runner/shims/Files.h"

namespace {

FILE* standardInput = stdin;
FILE* standardOutput = stdout;
FILE* standardError = stderr;

[[gnu::format(printf, 1, 2)]] int print(const char* format, ...) {
  std::va_list arguments;
  va_start(arguments, format);
  const int result = convertingErrno([&] { return std::vprintf(format, arguments); });
  va_end(arguments);
  return result;
}

[[gnu::format(printf, 2, 3)]] int printTo(FILE* file, const char* format, ...) {
  std::va_list arguments;
  va_start(arguments, format);
  const int result = convertingErrno([&] { return std::vfprintf(file, format, arguments); });
  va_end(arguments);
  return result;
}

void describeError(const char* text) {
  using Text = char* (*)(int);
  const auto textOf = reinterpret_cast<Text>(const_cast<void*>(shimNamed("strerror")));
  std::fprintf(stderr, "%s: %s\n", text, textOf(errno));
}

int renameAtWith(int fromFolder, const char* from, int toFolder, const char* to, unsigned flags) {
  constexpr unsigned kSwap = 2;
  constexpr unsigned kNeverReplace = 4;
  if ((flags & ~(kSwap | kNeverReplace)) != 0) refuse("renameatx_np is called with the flags 0x%x", flags);
  const unsigned linux =
      ((flags & kSwap) != 0 ? RENAME_EXCHANGE : 0U) | ((flags & kNeverReplace) != 0 ? RENAME_NOREPLACE : 0U);
  return converted(renameat2(linuxFolder(fromFolder), from, linuxFolder(toFolder), to, linux));
}

int renameWith(const char* from, const char* to, unsigned flags) {
  constexpr int kCurrentFolder = -2;
  return renameAtWith(kCurrentFolder, from, kCurrentFolder, to, flags);
}

}  // namespace

shims::Table shims::stdio() {
  static const Shim table[] = {
      shim("__stdinp", &standardInput),
      shim("__stdoutp", &standardOutput),
      shim("__stderrp", &standardError),
      shim("fclose", libraryCall<&::fclose>),
      shim("fdopen", systemCall<&::fdopen>),
      shim("fdopen$DARWIN_EXTSN", systemCall<&::fdopen>),
      shim("fflush", libraryCall<&::fflush>),
      shim("fgets", libraryCall<&::fgets>),
      shim("fileno", systemCall<&::fileno>),
      shim("fopen", systemCall<&::fopen>),
      shim("fopen$DARWIN_EXTSN", systemCall<&::fopen>),
      shim("fprintf", &printTo),
      shim("fputc", libraryCall<&::fputc>),
      shim("fputs", libraryCall<&::fputs>),
      shim("fputwc", libraryCall<&::fputwc>),
      shim("fread", libraryCall<&::fread>),
      shim("fseek", systemCall<&::fseek>),
      shim("fseeko", systemCall<&::fseeko>),
      shim("ftell", systemCall<&::ftell>),
      shim("ftello", systemCall<&::ftello>),
      shim("fwrite", libraryCall<&::fwrite>),
      shim("getc", libraryCall<&::getc>),
      shim("getwc", libraryCall<&::getwc>),
      shim("perror", &describeError),
      shim("printf", &print),
      shim("putc", libraryCall<&::putc>),
      shim("putchar", libraryCall<&::putchar>),
      shim("puts", libraryCall<&::puts>),
      shim("remove", systemCall<&::remove>),
      shim("renameatx_np", &renameAtWith),
      shim("renamex_np", &renameWith),
      shim("setbuf", &::setbuf),
      shim("setvbuf", &::setvbuf),
      shim("snprintf", &::snprintf),
      shim("sprintf", &::sprintf),
      shim("sscanf", &::sscanf),
      shim("tmpfile", systemCall<&::tmpfile>),
      shim("ungetc", &::ungetc),
      shim("ungetwc", &::ungetwc),
      shim("vasprintf", &::vasprintf),
      shim("vfprintf", libraryCall<&::vfprintf>),
      shim("vprintf", libraryCall<&::vprintf>),
      shim("vsnprintf", &::vsnprintf),
  };
  return table;
}
