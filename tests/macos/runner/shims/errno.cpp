#include <algorithm>
#include <cstring>
#include <string>

#include "tests/macos/runner/Shims.h"

namespace {

// What differs. Numbers up to 34 are the same, except for 11 and what Linux calls 35.
struct Error {
  int linux;
  int darwin;
};

constexpr Error kErrors[] = {
    {EAGAIN, 35},
    {EDEADLK, 11},
    {EINPROGRESS, 36},
    {EALREADY, 37},
    {ENOTSOCK, 38},
    {EDESTADDRREQ, 39},
    {EMSGSIZE, 40},
    {EPROTOTYPE, 41},
    {ENOPROTOOPT, 42},
    {EPROTONOSUPPORT, 43},
    {ESOCKTNOSUPPORT, 44},
    {EOPNOTSUPP, 102},
    {EPFNOSUPPORT, 46},
    {EAFNOSUPPORT, 47},
    {EADDRINUSE, 48},
    {EADDRNOTAVAIL, 49},
    {ENETDOWN, 50},
    {ENETUNREACH, 51},
    {ENETRESET, 52},
    {ECONNABORTED, 53},
    {ECONNRESET, 54},
    {ENOBUFS, 55},
    {EISCONN, 56},
    {ENOTCONN, 57},
    {ESHUTDOWN, 58},
    {ETOOMANYREFS, 59},
    {ETIMEDOUT, 60},
    {ECONNREFUSED, 61},
    {ELOOP, 62},
    {ENAMETOOLONG, 63},
    {EHOSTDOWN, 64},
    {EHOSTUNREACH, 65},
    {ENOTEMPTY, 66},
    {EUSERS, 68},
    {EDQUOT, 69},
    {ESTALE, 70},
    {ENOLCK, 77},
    {ENOSYS, 78},
    {EOVERFLOW, 84},
    {ECANCELED, 89},
    {EIDRM, 90},
    {ENOMSG, 91},
    {EILSEQ, 92},
    {EBADMSG, 94},
    {EMULTIHOP, 95},
    {ENODATA, 96},
    {ENOLINK, 97},
    {ENOSR, 98},
    {ENOSTR, 99},
    {EPROTO, 100},
    {ETIME, 101},
    {EOWNERDEAD, 105},
    {ENOTRECOVERABLE, 104},
};

constexpr int kLastCommonError = 34;

std::string textOf(int darwin) {
  if (darwin < 0 || (darwin > kLastCommonError && linuxError(darwin) == darwin)) {
    return "Unknown error: " + std::to_string(darwin);
  }
  if (darwin == 0) return "Undefined error: 0";
  // macOS has other words than Linux for the errors that programs often show.
  switch (darwin) {
    case EIO:
      return "Input/output error";
    case EBUSY:
      return "Resource busy";
    case EXDEV:
      return "Cross-device link";
    case ENODEV:
      return "Operation not supported by device";
    case ENOTTY:
      return "Inappropriate ioctl for device";
    case ERANGE:
      return "Result too large";
    default:
      break;
  }
  return strerror(linuxError(darwin));
}

char* textOfError(int darwin) {
  static thread_local std::string text;
  text = textOf(darwin);
  return text.data();
}

int copyTextOfError(int darwin, char* buffer, std::size_t size) {
  const std::string text = textOf(darwin);
  if (size != 0) {
    const std::size_t length = std::min(text.size(), size - 1);
    text.copy(buffer, length);
    buffer[length] = 0;
  }
  if (text.size() >= size) return ERANGE;
  return text.starts_with("Unknown") ? EINVAL : 0;
}

}  // namespace

int darwinError(int error) {
  for (const Error& each : kErrors) {
    if (each.linux == error) return each.darwin;
  }
  if (error > kLastCommonError) refuse("macOS has no error that is like number %d of Linux", error);
  return error;
}

int linuxError(int error) {
  for (const Error& each : kErrors) {
    if (each.darwin == error) return each.linux;
  }
  return error;
}

shims::Table shims::errnoTable() {
  static const Shim table[] = {
      shim("__error", &__errno_location),
      shim("strerror", &textOfError),
      shim("strerror_r", &copyTextOfError),
  };
  return table;
}
