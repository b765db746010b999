#include "Runtime/Process/Private/SymbolTables.h"

#include <elf.h>
#include <fcntl.h>
#include <link.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <bit>
#include <cerrno>
#include <cstring>
#include <new>
#include <span>
#include <type_traits>

#include "Runtime/Base/Private/FileDescriptor.h"

namespace rt::detail {

// An image that is loaded into this process.
struct SymbolTables::Image {
  std::uint64_t address;
  std::string path;
  // The difference between an address in memory and the address in the file.
  std::uint64_t bias = 0;
  std::uint64_t start = 0;
  std::vector<Elf64_Phdr> headers;
};

namespace {

// The largest size of a table. Larger tables are ignored.
constexpr std::uint64_t kLargestTable = std::uint64_t{256} << 20U;

// A file that checks each read against its size. It is read and not mapped, since another process may shorten
// the file at any time.
class ElfFile {
 public:
  explicit ElfFile(const char* path) : file_(open(path, O_RDONLY | O_CLOEXEC | O_NONBLOCK)) {
    struct stat status{};
    if (file_ && fstat(file_.get(), &status) == 0 && S_ISREG(status.st_mode)) {
      size_ = static_cast<std::uint64_t>(status.st_size);
    }
  }

  // Fills `bytes` from `offset`. Returns false if the file does not have that many bytes there.
  bool read(std::span<std::byte> bytes, std::uint64_t offset) const {
    if (!has(offset, bytes.size())) return false;
    while (!bytes.empty()) {
      const ssize_t count = pread(file_.get(), bytes.data(), bytes.size(), static_cast<off_t>(offset));
      if (count < 0 && errno == EINTR) continue;
      if (count <= 0) return false;
      bytes = bytes.subspan(static_cast<std::size_t>(count));
      offset += static_cast<std::uint64_t>(count);
    }
    return true;
  }

  // Returns the `count` values at `offset`, or no values if the file is too short for them.
  template <class Value>
  std::vector<Value> values(std::uint64_t offset, std::uint64_t count) const {
    static_assert(std::is_trivially_copyable_v<Value>);
    if (count > kLargestTable / sizeof(Value) || !has(offset, count * sizeof(Value))) return {};
    std::vector<Value> values(count);
    if (!read(std::as_writable_bytes(std::span(values)), offset)) return {};
    return values;
  }

 private:
  bool has(std::uint64_t offset, std::uint64_t size) const {
    return offset <= size_ && size <= size_ - offset;
  }

  FileDescriptor file_;
  std::uint64_t size_ = 0;
};

}  // namespace

std::optional<SymbolTables::Symbol> SymbolTables::find(std::uint64_t address) {
  constexpr int kFound = 1;
  constexpr int kOutOfMemory = 2;
  Image image{.address = address, .path = {}, .headers = {}};
  const auto isThere = [](dl_phdr_info* info, std::size_t, void* argument) -> int {
    Image& found = *static_cast<Image*>(argument);
    const std::span headers(info->dlpi_phdr, info->dlpi_phnum);
    found.bias = info->dlpi_addr;
    std::uint64_t lowest = ~std::uint64_t{0};
    bool contains = false;
    for (const Elf64_Phdr& header : headers) {
      // `dlpi_addr` may be wrong for a statically linked program. The address of its headers gives the bias.
      if (header.p_type == PT_PHDR)
        found.bias = std::bit_cast<std::uint64_t>(info->dlpi_phdr) - header.p_vaddr;
    }
    for (const Elf64_Phdr& header : headers) {
      if (header.p_type != PT_LOAD) continue;
      lowest = std::min(lowest, header.p_vaddr);
      contains = contains || found.address - found.bias - header.p_vaddr < header.p_memsz;
    }
    if (!contains) return 0;
    found.start = found.bias + lowest;
    // Copies here, while the image cannot be unloaded. No exception may pass through the C library. At the
    // first one it loads the unwinder, and without memory it ends the program.
    try {
      found.path = info->dlpi_name;
      found.headers.assign(headers.begin(), headers.end());
      return kFound;
    } catch (const std::bad_alloc&) {
      return kOutOfMemory;
    }
  };
  const int result = dl_iterate_phdr(isThere, &image);
  if (result == kOutOfMemory) throw std::bad_alloc();
  if (result != kFound) return std::nullopt;

  const auto [known, isNew] = tables_.try_emplace(image.start);
  Table& table = known->second;
  if (isNew) table = read(image);
  Symbol symbol{.image = image.path, .imageStart = image.start, .function = {}, .functionStart = 0};
  for (const Function& function : table.functions) {
    if (address - image.bias - function.start >= function.size) continue;
    // The last name in a damaged table may lack its NUL.
    symbol.function = std::string_view(table.names).substr(function.name);
    symbol.function.resize(std::min(symbol.function.find('\0'), symbol.function.size()));
    symbol.functionStart = image.bias + function.start;
    break;
  }
  return symbol;
}

SymbolTables::Table SymbolTables::read(const Image& image) {
  const ElfFile file(image.path.empty() ? "/proc/self/exe" : image.path.c_str());
  Elf64_Ehdr header{};
  if (!file.read(std::as_writable_bytes(std::span(&header, 1)), 0)) return {};
  constexpr unsigned char kByteOrder = std::endian::native == std::endian::little ? ELFDATA2LSB : ELFDATA2MSB;
  if (std::memcmp(header.e_ident, ELFMAG, SELFMAG) != 0 || header.e_ident[EI_CLASS] != ELFCLASS64 ||
      header.e_ident[EI_DATA] != kByteOrder || header.e_phentsize != sizeof(Elf64_Phdr) ||
      header.e_shentsize != sizeof(Elf64_Shdr)) {
    return {};
  }
  // Another file may have replaced the one that was loaded.
  const auto programHeaders = file.values<Elf64_Phdr>(header.e_phoff, header.e_phnum);
  if (programHeaders.size() != image.headers.size() ||
      std::memcmp(programHeaders.data(), image.headers.data(), programHeaders.size() * sizeof(Elf64_Phdr)) !=
          0) {
    return {};
  }
  const auto sections = file.values<Elf64_Shdr>(header.e_shoff, header.e_shnum);
  for (const Elf64_Shdr& section : sections) {
    if (section.sh_type != SHT_SYMTAB || section.sh_link >= sections.size()) continue;
    const Elf64_Shdr& text = sections[section.sh_link];
    const auto names = file.values<char>(text.sh_offset, text.sh_size);
    Table table{.functions = {}, .names = {names.begin(), names.end()}};
    for (const Elf64_Sym& symbol :
         file.values<Elf64_Sym>(section.sh_offset, section.sh_size / sizeof(Elf64_Sym))) {
      const bool isFunction = ELF64_ST_TYPE(symbol.st_info) == STT_FUNC && symbol.st_shndx != SHN_UNDEF;
      if (isFunction && symbol.st_name < table.names.size()) {
        table.functions.push_back({symbol.st_value, symbol.st_size, symbol.st_name});
      }
    }
    return table;
  }
  return {};
}

}  // namespace rt::detail
