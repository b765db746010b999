#include "Runtime/Defaults/Private/FilePath.h"

#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <memory>
#include <new>
#include <system_error>

// Not std::filesystem: it brings the standard library's streams and locales into every program, with two
// dozen objects that are made before `main`.

namespace rt {

namespace {

using SystemText = std::unique_ptr<char, decltype(&std::free)>;

}  // namespace

std::string absolutePath(std::string path) {
  if (path.starts_with('/')) return path;
  const SystemText folder(getcwd(nullptr, 0), &std::free);
  if (folder == nullptr)
    throw std::system_error(errno, std::generic_category(), "no path to the working folder");
  std::string whole = folder.get();
  if (!whole.ends_with('/')) whole += '/';
  return whole += path;
}

std::string folderOf(const std::string& path) {
  const std::size_t slash = path.find_last_of('/');
  if (slash == std::string::npos) return ".";
  return path.substr(0, std::max<std::size_t>(slash, 1));
}

std::string resolvedPath(const std::string& path) {
  const SystemText real(realpath(path.c_str(), nullptr), &std::free);
  if (real == nullptr && errno == ENOMEM) throw std::bad_alloc();
  return real != nullptr ? real.get() : path;
}

}  // namespace rt
