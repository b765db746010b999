// Looks up symbols in files of any content. A simple reading of the same bytes must find the same symbol, and
// nothing outside of the file may be read.
//
// An input is an address relative to the image, in 8 bytes, and the file of the image.
#include <dlfcn.h>
#include <elf.h>
#include <link.h>
#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "Runtime/Process/SymbolTables.h"

namespace {

void require(bool condition) {
  if (!condition) std::abort();
}

constexpr std::uint64_t kBias = 0x7000'0000'0000;

// The image that the process seems to have loaded, instead of its own images, while a look-up runs.
struct LoadedImage {
  std::string path;
  std::vector<Elf64_Phdr> headers;
};
thread_local const LoadedImage* loadedImage = nullptr;

// A file in memory, from which values are read one at a time.
class File {
 public:
  explicit File(std::string_view bytes) : bytes_(bytes) {}

  template <class Value>
  std::optional<Value> at(std::uint64_t offset) const {
    if (offset > bytes_.size() || bytes_.size() - offset < sizeof(Value)) return std::nullopt;
    Value value;
    std::memcpy(&value, bytes_.data() + offset, sizeof value);
    return value;
  }

  // Returns all `count` values, or no values if the file is too short for them.
  template <class Value>
  std::vector<Value> all(std::uint64_t offset, std::uint64_t count) const {
    std::vector<Value> values;
    for (std::uint64_t i = 0; i < count; ++i) {
      const std::optional<Value> value = at<Value>(offset + i * sizeof(Value));
      if (!value) return {};
      values.push_back(*value);
    }
    return values;
  }

 private:
  std::string_view bytes_;
};

// Returns the program headers that the system would have after loading this file.
std::vector<Elf64_Phdr> programHeaders(const File& file) {
  const auto header = file.at<Elf64_Ehdr>(0);
  return header ? file.all<Elf64_Phdr>(header->e_phoff, header->e_phnum) : std::vector<Elf64_Phdr>();
}

// The first function in the file's first symbol table that contains an address.
struct Function {
  std::string name;
  std::uint64_t start = 0;
};
Function functionAt(const File& file, std::uint64_t address) {
  const auto header = file.at<Elf64_Ehdr>(0);
  if (!header ||
      std::string_view(reinterpret_cast<const char*>(header->e_ident), 6) !=
          "\x7F"
          "ELF\2\1" ||
      header->e_phentsize != 56 || header->e_shentsize != 64) {
    return {};
  }
  const auto sections = file.all<Elf64_Shdr>(header->e_shoff, header->e_shnum);
  for (const Elf64_Shdr& section : sections) {
    if (section.sh_type != SHT_SYMTAB || section.sh_link >= sections.size()) continue;
    const Elf64_Shdr& text = sections[section.sh_link];
    const auto names = file.all<char>(text.sh_offset, text.sh_size);
    for (const Elf64_Sym& symbol : file.all<Elf64_Sym>(section.sh_offset, section.sh_size / 24)) {
      if (symbol.st_info % 16 != STT_FUNC || symbol.st_shndx == 0 || symbol.st_name >= names.size()) continue;
      // A function may extend over the highest address and continue at 0.
      if (address - symbol.st_value >= symbol.st_size) continue;
      const auto start = names.begin() + symbol.st_name;
      return {{start, std::find(start, names.end(), '\0')}, symbol.st_value};
    }
    break;
  }
  return {};
}

}  // namespace

// Replaces the function of the C library.
extern "C" int dl_iterate_phdr(int (*visit)(dl_phdr_info*, std::size_t, void*), void* context) {
  if (loadedImage == nullptr) {
    using Iterate = int(int (*)(dl_phdr_info*, std::size_t, void*), void*);
    static auto* const next = reinterpret_cast<Iterate*>(dlsym(RTLD_NEXT, "dl_iterate_phdr"));
    return next(visit, context);
  }
  dl_phdr_info info{};
  info.dlpi_addr = kBias;
  info.dlpi_name = loadedImage->path.c_str();
  info.dlpi_phdr = loadedImage->headers.data();
  info.dlpi_phnum = static_cast<Elf64_Half>(loadedImage->headers.size());
  return visit(&info, sizeof info, context);
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  std::uint64_t offset = 0;
  if (size < sizeof offset) return 0;
  std::memcpy(&offset, data, sizeof offset);
  const std::string bytes(reinterpret_cast<const char*>(data) + sizeof offset, size - sizeof offset);
  const File file(bytes);

  // All inputs use one file, which gets exactly the input's size.
  static const int descriptor = memfd_create("image", MFD_CLOEXEC);
  require(ftruncate(descriptor, 0) == 0);
  require(pwrite(descriptor, bytes.data(), bytes.size(), 0) == static_cast<ssize_t>(bytes.size()));
  LoadedImage image{"/proc/self/fd/" + std::to_string(descriptor), programHeaders(file)};
  // Leaves out files with a header PT_PHDR. The look-up would take the bias from the place of these headers
  // in memory, which no loader has chosen.
  const bool hasSelf = std::ranges::any_of(image.headers, [](auto& each) { return each.p_type == PT_PHDR; });
  if (hasSelf) return 0;

  rt::detail::SymbolTables tables;
  loadedImage = &image;
  const auto symbol = tables.find(kBias + offset);
  // The second look-up uses the table that the first has read.
  const auto again = tables.find(kBias + offset);
  loadedImage = nullptr;

  const bool isInImage = std::ranges::any_of(image.headers, [offset](const Elf64_Phdr& each) {
    return each.p_type == PT_LOAD && offset - each.p_vaddr < each.p_memsz;
  });
  require(symbol.has_value() == isInImage && again.has_value() == isInImage);
  if (!symbol) return 0;
  require(symbol->image == image.path);
  const Function function = functionAt(file, offset);
  require(symbol->function == function.name);
  if (!function.name.empty()) require(symbol->functionStart == kBias + function.start);
  require(again->function == symbol->function && again->functionStart == symbol->functionStart);
  return 0;
}
