#include "Images.h"

#include <cxxabi.h>
#include <pthread.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <climits>
#include <cstdlib>
#include <deque>
#include <memory>
#include <mutex>
#include <set>

#include "Fixups.h"
#include "Refusal.h"
#include "Shims.h"
#include "ThreadLocals.h"

extern "C" void __cxa_finalize(void* image);

namespace {

constexpr std::string_view kSystemLibraries = "/usr/lib/";

// An image and what the loader knows of it. It is never destroyed, since other threads may look at it.
struct Loaded {
  Loaded(const std::string& path, FileBytes bytes) : image(path, bytes) {}

  Image image;
  // One for each library, in the order of ordinals. Null stands for the system's library and for a missing
  // one.
  std::vector<Loaded*> libraries;
  // How many `open`s and images need this one.
  int users = 0;
  bool isInitialised = false;
};

std::array<std::atomic<Loaded*>, Images::kMost> images{};
std::atomic<std::size_t> imageCount = 0;
// The system's own loader runs initialisers under such a lock.
std::recursive_mutex loading;
auto& beforeUnload = *new std::vector<void (*)(const void*, std::intptr_t)>;
// The names that no image and no shim has, with the image that imports them.
std::set<std::string> unknownNames;

template <class Function>
void forEachImage(Function function) {
  const std::size_t count = imageCount.load(std::memory_order_acquire);
  for (std::size_t number = 0; number < count; ++number) {
    if (Loaded* loaded = images[number].load(std::memory_order_acquire)) function(*loaded);
  }
}

template <class Predicate>
Loaded* firstImage(Predicate predicate) {
  const std::size_t count = imageCount.load(std::memory_order_acquire);
  for (std::size_t number = 0; number < count; ++number) {
    Loaded* loaded = images[number].load(std::memory_order_acquire);
    if (loaded != nullptr && predicate(*loaded)) return loaded;
  }
  return nullptr;
}

Loaded& program() {
  return *images[0].load(std::memory_order_acquire);
}

Loaded& unwinder() {
  return *images[1].load(std::memory_order_acquire);
}

Loaded& loadedOf(const Image& image) {
  return *firstImage([&](const Loaded& loaded) { return &loaded.image == &image; });
}

Loaded& add(const std::string& path, FileBytes bytes) {
  const std::size_t number = imageCount.load(std::memory_order_relaxed);
  if (number == Images::kMost) refuse("the program loads too many images");
  auto* const loaded = new Loaded(path, bytes);
  images[number].store(loaded, std::memory_order_release);
  imageCount.store(number + 1, std::memory_order_release);
  return *loaded;
}

// ---- Finding libraries ----

std::string folderOf(const std::string& path) {
  const std::size_t slash = path.rfind('/');
  return slash == std::string::npos ? "." : path.substr(0, slash);
}

std::string canonical(const std::string& path) {
  std::array<char, PATH_MAX> buffer{};
  return realpath(path.c_str(), buffer.data()) == nullptr ? std::string() : std::string(buffer.data());
}

// Replaces the loader's two names for folders at the path's beginning.
std::string expanded(std::string path, const Image& importer) {
  const auto replace = [&](std::string_view name, const std::string& image) {
    if (path.starts_with(name)) path = folderOf(image) + path.substr(name.size());
  };
  replace("@loader_path", importer.path());
  replace("@executable_path", program().image.path());
  return path;
}

// Returns the path of the library's file, or "".
std::string findLibrary(const Image& importer, const std::string& name) {
  constexpr std::string_view kSearched = "@rpath";
  if (!name.starts_with(kSearched)) return canonical(expanded(name, importer));
  for (const Image* image : {&importer, &std::as_const(program().image)}) {
    for (const std::string& folder : image->searchPaths()) {
      std::string found = canonical(expanded(folder, *image) + name.substr(kSearched.size()));
      if (!found.empty()) return found;
    }
  }
  return "";
}

Loaded& loadFile(const std::string& path);

// Loads the libraries that the image needs, and theirs.
void loadLibraries(Loaded& loaded) {
  for (const Image::Library& library : loaded.image.libraries()) {
    Loaded* found = nullptr;
    if (!library.name.starts_with(kSystemLibraries)) {
      const std::string path = findLibrary(loaded.image, library.name);
      if (path.empty() && !library.mayBeMissing) {
        refuse("%s needs %s, which is not there", loaded.image.path().c_str(), library.name.c_str());
      }
      if (!path.empty()) {
        found = &loadFile(path);
        ++found->users;
      }
    } else if (library.name != "/usr/lib/libSystem.B.dylib") {
      refuse("%s needs %s, for which there are no shims", loaded.image.path().c_str(), library.name.c_str());
    }
    loaded.libraries.push_back(found);
  }
}

Loaded& loadFile(const std::string& path) {
  if (Loaded* known = firstImage([&](const Loaded& loaded) { return loaded.image.path() == path; }))
    return *known;
  Loaded& loaded = add(path, bytesOfFile(path));
  loadLibraries(loaded);
  return loaded;
}

// ---- Looking names up ----

std::uint64_t addressOf(const void* pointer) {
  return reinterpret_cast<std::uint64_t>(pointer);
}

std::uint64_t exportOf(const Loaded& loaded, std::string_view name) {
  const std::optional<Image::Export> found = loaded.image.exported(name);
  return found ? found->address : 0;
}

std::uint64_t inSystem(std::string_view name) {
  if (const std::uint64_t address = exportOf(unwinder(), name)) return address;
  if (name.starts_with('_')) name.remove_prefix(1);
  return addressOf(shimNamed(name));
}

std::uint64_t inAnyImage(std::string_view name) {
  std::uint64_t address = 0;
  firstImage([&](const Loaded& loaded) { return (address = exportOf(loaded, name)) != 0; });
  return address != 0 ? address : inSystem(name);
}

// The definition that all images share: the first one that is not weak, else the first one.
std::uint64_t sharedDefinition(std::string_view name) {
  std::uint64_t weak = 0;
  std::uint64_t strong = 0;
  forEachImage([&](const Loaded& loaded) {
    if (strong != 0 || !loaded.image.sharesWeakSymbols()) return;
    const std::optional<Image::Export> found = loaded.image.exported(name);
    if (!found) return;
    if (!found->isWeak) strong = found->address;
    if (weak == 0) weak = found->address;
  });
  return strong != 0 ? strong : weak;
}

std::uint64_t resolve(const Loaded& importer, const Import& import) {
  switch (import.ordinal) {
    case macho::ordinal::kSelf:
      return exportOf(importer, import.name);
    case macho::ordinal::kMainProgram:
      return exportOf(program(), import.name);
    case macho::ordinal::kAnyImage:
      return inAnyImage(import.name);
    case macho::ordinal::kWeakDefinitions:
      return sharedDefinition(import.name);
    default:
      break;
  }
  const auto number = static_cast<std::size_t>(import.ordinal) - 1;
  if (import.ordinal < 0 || number >= importer.libraries.size()) {
    refuse("%s has an import with the ordinal %d", importer.image.path().c_str(), import.ordinal);
  }
  const Image::Library& library = importer.image.libraries()[number];
  if (const Loaded* loaded = importer.libraries[number]) return exportOf(*loaded, import.name);
  return library.name.starts_with(kSystemLibraries) ? inSystem(import.name) : 0;
}

// Whether an import may be null is a question of the system's version. The runner has one version only, so it
// does not guess: a name that it does not know is an error in any case, unless the name belongs to an image.
bool mayBeNull(const Loaded& importer, const Import& import) {
  if (!import.mayBeMissing) return false;
  if (import.ordinal <= 0) return true;
  return !importer.image.libraries()[static_cast<std::size_t>(import.ordinal) - 1].name.starts_with(
      kSystemLibraries);
}

void fixUp(const Loaded& loaded) {
  fixUp(loaded.image, [&](const Import& import) {
    const std::uint64_t address = resolve(loaded, import);
    if (address == 0 && !mayBeNull(loaded, import)) {
      unknownNames.insert(std::string(import.name) + " (" + loaded.image.path() + ")");
    }
    return address;
  });
}

// Fixes up and protects the images from the given number on. Refuses them if they import a name that is
// nowhere.
void prepare(std::size_t first) {
  const std::size_t count = imageCount.load(std::memory_order_acquire);
  for (std::size_t number = first; number < count; ++number)
    fixUp(*images[number].load(std::memory_order_acquire));
  if (!unknownNames.empty()) {
    std::string list;
    for (const std::string& name : unknownNames) list += "\n  " + name;
    refuse("neither an image nor a shim has these names:%s", list.c_str());
  }
  for (std::size_t number = first; number < count; ++number) {
    const Loaded& loaded = *images[number].load(std::memory_order_acquire);
    prepareThreadLocals(loaded.image);
    loaded.image.protect();
  }
}

// ---- Running ----

using Main = int (*)(int, char**, char**, const char**);

// macOS passes a fourth array of strings, which tells the system's own libraries about the process. It is
// empty here.
std::array<const char*, 1> systemStrings{};

void callInitialiser(const Loaded& loaded, std::uint64_t address) {
  if (!loaded.image.contains(address)) {
    refuse("an initialiser of %s is outside of it", loaded.image.path().c_str());
  }
  const Arguments& arguments = Images::arguments();
  reinterpret_cast<Main>(address)(arguments.count, arguments.values, environ, systemStrings.data());
}

template <class Number>
std::vector<Number> numbersIn(std::span<const std::byte> memory) {
  std::vector<Number> numbers;
  for (std::size_t at = 0; at + sizeof(Number) <= memory.size(); at += sizeof(Number)) {
    numbers.push_back(valueAt<Number>(memory, at));
  }
  return numbers;
}

// Libraries come before the images that need them. In an image, initialisers run in the order of the file.
void initialise(Loaded& loaded) {
  if (std::exchange(loaded.isInitialised, true)) return;
  for (Loaded* library : loaded.libraries) {
    if (library != nullptr) initialise(*library);
  }
  for (const macho::Section& section : loaded.image.sections()) {
    const std::span<const std::byte> memory = loaded.image.memory(section);
    if (section.type() == macho::SectionType::Initialisers) {
      for (const std::uint64_t address : numbersIn<std::uint64_t>(memory)) callInitialiser(loaded, address);
    } else if (section.type() == macho::SectionType::InitialiserOffsets) {
      for (const std::uint32_t offset : numbersIn<std::uint32_t>(memory)) {
        callInitialiser(loaded, loaded.image.start() + offset);
      }
    }
  }
}

void unload(Loaded& loaded) {
  for (const auto& function : beforeUnload) {
    function(loaded.image.header(), static_cast<std::intptr_t>(loaded.image.slide()));
  }
  __cxa_finalize(const_cast<void*>(loaded.image.header()));
  for (std::atomic<Loaded*>& place : images) {
    if (place.load(std::memory_order_relaxed) == &loaded) place.store(nullptr, std::memory_order_release);
  }
  loaded.image.unload();
  for (Loaded* library : loaded.libraries) {
    if (library != nullptr && --library->users == 0) unload(*library);
  }
}

}  // namespace

namespace Images {

Arguments& arguments() {
  static constinit Arguments values;
  return values;
}

int run(const std::string& path, FileBytes bytes, FileBytes unwinderBytes, const Arguments& given) {
  // In a child, the thread that has locked has another number, so the lock is made anew.
  pthread_atfork([] { loading.lock(); }, [] { loading.unlock(); }, [] { std::construct_at(&loading); });
  arguments() = given;
  Loaded& main = add(path, bytes);
  Loaded& unwinding = add("/usr/lib/system/libunwind.dylib", unwinderBytes);
  main.users = unwinding.users = 1;
  loadLibraries(main);
  loadLibraries(unwinding);
  prepare(0);
  {
    const std::lock_guard guard(loading);
    initialise(unwinding);
    initialise(main);
  }
  const auto entry = reinterpret_cast<Main>(main.image.entry());
  return entry(given.count, given.values, environ, systemStrings.data());
}

const Image* open(const std::string& path, int flags) {
  const std::lock_guard guard(loading);
  const std::string file = canonical(path);
  if (file.empty()) return nullptr;
  const bool isLoaded =
      firstImage([&](const Loaded& loaded) { return loaded.image.path() == file; }) != nullptr;
  if ((flags & kOnlyIfLoaded) != 0 && !isLoaded) return nullptr;
  const std::size_t first = count();
  Loaded& loaded = loadFile(file);
  if ((flags & kNeverUnload) != 0) ++loaded.users;
  ++loaded.users;
  prepare(first);
  initialise(loaded);
  return &loaded.image;
}

void close(const Image& image) {
  const std::lock_guard guard(loading);
  Loaded& loaded = loadedOf(image);
  if (--loaded.users == 0) unload(loaded);
}

void callBeforeUnload(void (*function)(const void*, std::intptr_t)) {
  const std::lock_guard guard(loading);
  beforeUnload.push_back(function);
}

std::size_t count() {
  return imageCount.load(std::memory_order_acquire);
}

const Image* at(std::size_t number) {
  if (number >= count()) return nullptr;
  const Loaded* loaded = images[number].load(std::memory_order_acquire);
  return loaded == nullptr ? nullptr : &loaded->image;
}

const Image* containing(const void* address) {
  const Loaded* loaded = firstImage([&](const Loaded& each) { return each.image.contains(address); });
  return loaded == nullptr ? nullptr : &loaded->image;
}

const Image* withHeader(const void* header) {
  const Loaded* loaded = firstImage([&](const Loaded& each) { return each.image.header() == header; });
  return loaded == nullptr ? nullptr : &loaded->image;
}

const void* lookUp(std::string_view name) {
  return reinterpret_cast<const void*>(inAnyImage(name));
}

const void* lookUpIn(const Image& image, std::string_view name) {
  const Loaded& loaded = loadedOf(image);
  std::uint64_t address = exportOf(loaded, name);
  for (const Loaded* library : loaded.libraries) {
    if (address == 0 && library != nullptr) address = exportOf(*library, name);
  }
  return reinterpret_cast<const void*>(address);
}

}  // namespace Images
