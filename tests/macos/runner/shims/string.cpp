#include <strings.h>

#include <cstring>

#include "tests/macos/runner/Shims.h"

shims::Table shims::string() {
  static const Shim table[] = {
      shim("__bzero", &::bzero),
      shim("bzero", &::bzero),
      shim<const void*(const void*, int, std::size_t)>("memchr", ::memchr),
      shim("memcmp", &::memcmp),
      shim("memcpy", &::memcpy),
      shim("memmove", &::memmove),
      shim("memset", &::memset),
      shim(
          "memset_pattern16",
          +[](void* to, const void* pattern, std::size_t size) {
            auto* bytes = static_cast<char*>(to);
            for (std::size_t at = 0; at < size; ++at) bytes[at] = static_cast<const char*>(pattern)[at % 16];
          }),
      shim("strcasecmp", &::strcasecmp),
      shim("strcat", &::strcat),
      shim<const char*(const char*, int)>("strchr", ::strchr),
      shim("strcmp", &::strcmp),
      shim("strcpy", &::strcpy),
      shim("strdup", &::strdup),
      shim("strlen", &::strlen),
      shim("strncasecmp", &::strncasecmp),
      shim("strncmp", &::strncmp),
      shim("strncpy", &::strncpy),
      shim("strnlen", &::strnlen),
      shim<const char*(const char*, const char*)>("strpbrk", ::strpbrk),
      shim<const char*(const char*, int)>("strrchr", ::strrchr),
      shim<const char*(const char*, const char*)>("strstr", ::strstr),
  };
  return table;
}
