#include "Runtime/Defaults/Private/FilePath.h"

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <memory>
#include <new>

// Not std::filesystem: it brings the standard library's streams and locales into every program, with two
// dozen objects that are constructed before `main`.

namespace rt {

std::string folderOf(const std::string& path) {
  return path.substr(0, std::max<std::size_t>(path.find_last_of('/'), 1));
}

std::string resolvedPath(const std::string& path) {
  const std::unique_ptr<char, decltype(&std::free)> real(realpath(path.c_str(), nullptr), &std::free);
  if (real == nullptr && errno == ENOMEM) throw std::bad_alloc();
  return real != nullptr ? real.get() : path;
}

}  // namespace rt
