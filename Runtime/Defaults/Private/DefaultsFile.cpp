#include "Runtime/Defaults/Private/DefaultsFile.h"

#include <fcntl.h>
#include <sys/file.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <system_error>
#include <utility>

#include "Runtime/Defaults/Private/FilePath.h"

namespace rt {

namespace {

[[noreturn]] void fail(int error, const std::string& what) {
  throw std::system_error(error, std::generic_category(), what);
}

timespec changeTime(const struct stat& status) {
#ifdef __APPLE__
  return status.st_ctimespec;
#else
  return status.st_ctim;
#endif
}

// What `call` gives, which is called again as long as it is interrupted.
template <class Call>
int untilNotInterrupted(Call call) {
  int result = -1;
  do {
    result = call();
  } while (result == -1 && errno == EINTR);
  return result;
}

void makeFolders(const std::string& folder) {
  if (mkdir(folder.c_str(), 0700) == 0 || errno == EEXIST) return;
  if (errno == ENOENT) {
    const std::string parent = folderOf(folder);
    if (parent != folder) {
      makeFolders(parent);
      if (mkdir(folder.c_str(), 0700) == 0 || errno == EEXIST) return;
    }
  }
  fail(errno, "cannot make the folder " + folder);
}

// A file that is removed again unless it becomes another.
class TemporaryFile {
 public:
  explicit TemporaryFile(const std::string& path)
      : file_(untilNotInterrupted([&] {
          path_ = path + ".XXXXXX";
          return mkostemp(path_.data(), O_CLOEXEC);
        })) {
    if (!file_) fail(errno, "cannot make " + path_);
  }
  TemporaryFile(const TemporaryFile&) = delete;
  TemporaryFile& operator=(const TemporaryFile&) = delete;
  ~TemporaryFile() {
    if (!path_.empty()) unlink(path_.c_str());
  }

  void takeOver(const struct stat& status) const {
    // The owner first, as a change of it may take bits of the mode away. Who may not give a file away
    // keeps it.
    untilNotInterrupted([&] { return fchown(file_.get(), status.st_uid, status.st_gid); });
    untilNotInterrupted([&] { return fchmod(file_.get(), status.st_mode & 07777U); });
  }

  void write(std::string_view content) const {
    file_.write(content);
    if (untilNotInterrupted([&] { return fsync(file_.get()); }) != 0) fail(errno, "cannot write");
  }

  void become(const std::string& path) {
    if (rename(path_.c_str(), path.c_str()) != 0) fail(errno, "cannot replace");
    path_.clear();
  }

 private:
  std::string path_;
  FileDescriptor file_;
};

}  // namespace

DefaultsFile::Version DefaultsFile::version() const noexcept {
  Version version;
  timespec now{};
  // Before the status, so that a change after this moment is of this moment or later.
  clock_gettime(CLOCK_REALTIME, &now);
  version.exists_ = stat(path_.c_str(), &version.status_) == 0;
  // File systems count in steps of up to two seconds.
  version.isSettled_ = version.exists_ ? changeTime(version.status_).tv_sec + 2 < now.tv_sec
                                       : errno == ENOENT || errno == ENOTDIR;
  return version;
}

bool DefaultsFile::isStill(const Version& version) const noexcept {
  if (!version.isSettled_) return false;
  struct stat status{};
  if (stat(path_.c_str(), &status) != 0) return !version.exists_ && (errno == ENOENT || errno == ENOTDIR);
  const timespec time = changeTime(status);
  const timespec other = changeTime(version.status_);
  return version.exists_ && status.st_ino == version.status_.st_ino &&
         status.st_dev == version.status_.st_dev && status.st_size == version.status_.st_size &&
         time.tv_sec == other.tv_sec && time.tv_nsec == other.tv_nsec;
}

std::optional<std::string> DefaultsFile::content(std::size_t maximumSize) const {
  FileDescriptor file;
  try {
    // Without O_NONBLOCK, a pipe of that name would keep the caller waiting.
    file = FileDescriptor::open(path_, O_RDONLY | O_NONBLOCK);
  } catch (const std::system_error& error) {
    if (error.code().value() == ENOENT || error.code().value() == ENOTDIR) return std::nullopt;
    throw;
  }
  struct stat status{};
  if (fstat(file.get(), &status) != 0) fail(errno, "cannot read " + path_);
  if (!S_ISREG(status.st_mode)) fail(EINVAL, "no plain file: " + path_);

  // The size may change meanwhile.
  std::string content;
  std::size_t length = 0;
  for (;;) {
    content.resize(length + 4096);
    const ssize_t count = read(file.get(), content.data() + length, content.size() - length);
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) fail(errno, "cannot read " + path_);
    length += static_cast<std::size_t>(count);
    if (length > maximumSize) fail(EFBIG, "cannot read " + path_);
    if (count == 0) break;
  }
  content.resize(length);
  return content;
}

DefaultsFile::Lock::Lock(FileDescriptor folder) noexcept : folder_(std::move(folder)) {
  while (flock(folder_.get(), LOCK_EX) != 0 && errno == EINTR) {
  }
}

DefaultsFile::Lock::~Lock() {
  // Closing would not do where a child has been forked meanwhile.
  if (folder_) flock(folder_.get(), LOCK_UN);
}

DefaultsFile::Lock DefaultsFile::lock() const {
  const std::string folder = folderOf(resolvedPath(path_));
  makeFolders(folder);
  return Lock(FileDescriptor::open(folder, O_RDONLY | O_DIRECTORY));
}

void DefaultsFile::replace(std::string_view content) const {
  const std::string path = resolvedPath(path_);
  const std::string folder = folderOf(path);
  try {
    struct stat status{};
    const bool exists = stat(path.c_str(), &status) == 0;
    if (exists && faccessat(AT_FDCWD, path.c_str(), W_OK, AT_EACCESS) != 0) fail(errno, "cannot write");
    TemporaryFile file(path);
    if (exists) file.takeOver(status);
    file.write(content);
    file.become(path);
    // So that the new name, too, is there after a loss of power. The file has been replaced by now, so
    // that to report a failure would mislead.
    const FileDescriptor opened(
        untilNotInterrupted([&] { return ::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC); }));
    if (opened) untilNotInterrupted([&] { return fsync(opened.get()); });
  } catch (const std::system_error& error) {
    fail(error.code().value(), "cannot write " + path);
  }
}

}  // namespace rt
