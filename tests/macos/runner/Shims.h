#pragma once

#include <cerrno>
#include <concepts>
#include <cstddef>
#include <span>
#include <string_view>
#include <utility>

#include "Refusal.h"

/// A function or variable that stands in for one of macOS's libSystem. The name has no underscore in front.
struct Shim {
  std::string_view name;
  const void* address;
};

/// Returns the address of a shim, or null if there is none of this name.
const void* shimNamed(std::string_view name);

/// Makes an entry of a table of shims. For a function with overloads, name the type:
/// `shim<double(double)>("ceil", ceil)`.
template <class Type>
Shim shim(std::string_view name, Type* object) {
  if constexpr (std::is_function_v<Type>) {
    return {name, reinterpret_cast<const void*>(object)};
  } else {
    return {name, object};
  }
}

/// The numbers of errors that differ. A program's `errno` is that of the C library, and has macOS's number
/// whenever the program can see it.
int darwinError(int linuxError);
int linuxError(int darwinError);

/// Gives `errno` macOS's number, after a failed call of the C library.
inline void convertErrno() {
  errno = darwinError(errno);
}

/// Returns `result`. If it is the failure of a system call, -1 or null, converts `errno` first.
template <class Result>
Result converted(Result result) {
  if constexpr (std::is_pointer_v<Result>) {
    if (result == nullptr) convertErrno();
  } else {
    if (result == static_cast<Result>(-1)) convertErrno();
  }
  return result;
}

/// Calls `call`, and converts `errno` if the call sets it. For functions that set it with several results.
template <class Call>
auto convertingErrno(Call call) {
  const int before = std::exchange(errno, 0);
  auto result = call();
  errno = errno == 0 ? before : darwinError(errno);
  return result;
}

namespace shims {

template <auto Function>
struct Converting {
  template <class Result, class... Arguments>
  static constexpr auto systemCall(Result (*)(Arguments...)) {
    return +[](Arguments... arguments) -> Result { return converted(Function(arguments...)); };
  }
  template <class Result, class... Arguments>
  static constexpr auto libraryCall(Result (*)(Arguments...)) {
    return +[](Arguments... arguments) -> Result {
      return convertingErrno([&] { return Function(arguments...); });
    };
  }
  template <class Result, class... Arguments>
  static constexpr auto errorCall(Result (*)(Arguments...)) {
    return +[](Arguments... arguments) -> Result { return darwinError(Function(arguments...)); };
  }
};

}  // namespace shims

/// The function with the same arguments whose failure, -1 or null, has macOS's `errno`.
template <auto Function>
inline constexpr auto systemCall = shims::Converting<Function>::systemCall(Function);
/// The function with the same arguments that, if it sets `errno`, sets it as on macOS.
template <auto Function>
inline constexpr auto libraryCall = shims::Converting<Function>::libraryCall(Function);
/// The function with the same arguments that returns macOS's number of an error, or 0.
template <auto Function>
inline constexpr auto errorCall = shims::Converting<Function>::errorCall(Function);

// One table for each header of macOS, in a file that is named after the header.
namespace shims {

using Table = std::span<const Shim>;

Table copyfile();
Table coreFoundation();
Table ctype();
Table cxxabi();
Table dirent();
Table dispatch();
Table dlfcn();
Table errnoTable();
Table execinfo();
Table fcntl();
Table machine();
Table math();
Table nlTypes();
Table osLock();
Table osLog();
Table osSync();
Table pthread();
Table regex();
Table signal();
Table stdio();
Table stdlib();
Table string();
Table sysEvent();
Table sysMman();
Table sysResource();
Table sysSelect();
Table sysSocket();
Table sysStat();
Table sysStatvfs();
Table sysWait();
Table time();
Table unistd();
Table wchar();
Table xlocale();

}  // namespace shims
