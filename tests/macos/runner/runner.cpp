// macos-runner PROGRAM [ARGUMENT…]
//
// Runs a Mach-O program for x86-64 on Linux, at the processor's own speed. The program's code is mapped and
// called; what it imports from libSystem are functions of the C library, or shims that translate between the
// systems.
//
// macos-runner --argument-0 NAME PROGRAM [ARGUMENT…]
//
// Does so, and passes NAME as the program's first argument.
//
// macos-runner --join PROGRAM FILE
//
// Writes a program for Linux to FILE that runs PROGRAM, which it contains. Such a program may run
// set-user-ID.
//
// Exits with 125 where it would have to guess what macOS does, and says why. Before the program runs, it does
// so with the names of all imports that it does not know. A test case that NotShown.txt lists is not run.

#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <iterator>
#include <string>
#include <string_view>

#include "tests/macos/runner/Images.h"
#include "tests/macos/runner/NotShown.h"
#include "tests/macos/runner/Refusal.h"

// The unwinder is a library that was built for macOS. The assembler puts its bytes here.
asm(R"(
  .section .rodata
  .balign 16
  .globl macosRunnerUnwinder
macosRunnerUnwinder:
  .incbin ")" UNWINDER R"("
  .globl macosRunnerUnwinderEnd
macosRunnerUnwinderEnd:
  .text
)");
extern "C" const std::byte macosRunnerUnwinder[];
extern "C" const std::byte macosRunnerUnwinderEnd[];

namespace {

constexpr const char* kRunner = "/proc/self/exe";

// The last bytes of a joined program.
struct Trailer {
  std::uint64_t size;
  std::array<char, 8> mark;
};
constexpr std::array<char, 8> kMark = {'j', 'o', 'i', 'n', 'e', 'd', '-', '1'};

// The program that is joined to this runner, or nothing.
FileBytes joinedProgram() {
  const FileBytes runner = bytesOfFile(kRunner);
  if (runner.size() < sizeof(Trailer)) return {};
  const std::size_t end = runner.size() - sizeof(Trailer);
  const auto trailer = valueAt<Trailer>(runner, end);
  if (trailer.mark != kMark || trailer.size > end) return {};
  return runner.subspan(end - trailer.size, trailer.size);
}

std::string_view textOf(FileBytes bytes) {
  const void* const first = bytes.data();
  return {static_cast<const char*>(first), bytes.size()};
}

int join(const char* program, const char* path) {
  const FileBytes bytes = bytesOfFile(program);
  if (!isMachO(bytes)) refuse("%s is not a Mach-O file for x86-64", program);
  const Trailer trailer{.size = bytes.size(), .mark = kMark};
  std::ofstream file(path, std::ios::binary | std::ios::trunc);
  file << textOf(bytesOfFile(kRunner)) << textOf(bytes) << textOf(std::as_bytes(std::span(&trailer, 1)));
  if (!file.flush().good() || chmod(path, 0755) != 0) refuse("%s cannot be written", path);
  return 0;
}

std::string absolute(const char* path) {
  std::array<char, PATH_MAX> buffer{};
  return realpath(path, buffer.data()) == nullptr ? path : buffer.data();
}

int run(const std::string& path, FileBytes program, int count, char** arguments) {
  return Images::run(path, program, {&macosRunnerUnwinder[0], &macosRunnerUnwinderEnd[0]},
                     {.count = count, .values = arguments});
}

}  // namespace

int main(int count, char** arguments) {
  if (const FileBytes joined = joinedProgram(); !joined.empty()) {
    std::exit(run(absolute(kRunner), joined, count, arguments));
  }
  int at = 1;
  const auto is = [&](const char* option) { return at < count && std::strcmp(arguments[at], option) == 0; };
  if (is("--join") && count == 4) return join(arguments[2], arguments[3]);
  char* name = nullptr;
  if (is("--argument-0") && count >= 4) {
    name = arguments[2];
    at = 3;
  }
  if (at >= count) {
    std::fprintf(stderr,
                 "usage: macos-runner [--argument-0 NAME] PROGRAM [ARGUMENT...]\n"
                 "       macos-runner --join PROGRAM FILE\n");
    return 2;
  }
  const std::string path = absolute(arguments[at]);
  if (skipCasesNotShown(path, count - at, arguments + at)) return 0;
  if (name != nullptr) arguments[at] = name;
  std::exit(run(path, bytesOfFile(path), count - at, arguments + at));
}
