#pragma once

/// A property list in the binary format "bplist00". Reads it from untrusted bytes, and writes it.
///
///     rt::PropertyList list;
///     const auto key = list.add("answer");
///     const auto value = list.add(std::int64_t{42});
///     list.root = list.add(rt::PropertyList::Dictionary{{key, value}});
///     std::vector<std::byte> bytes = list.encoded();
///
///     rt::PropertyList read = rt::PropertyList::decoded(bytes);      // throws MalformedPropertyList
///     read.find(read.root, "answer");                                // the index of 42
///
/// All values are in one table, in the order of the file. Collections refer to their elements by index. A
/// value that many collections share is in the table once. So reading takes time and memory in proportion
/// to the size of the file, whatever it contains.
///
/// The format also has dates, data and real numbers of four bytes. They are refused, since no archive has
/// any.
///
/// Threads: as safe as a std::vector.
///
/// Not for: objects (Runtime/Archive/KeyedUnarchiver.h); settings that people edit
/// (Runtime/Defaults/UserDefaults.h); property lists in XML.

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>
#include <variant>
#include <vector>

namespace rt {

/// The bytes are not a property list. `what()` says why, and at which byte.
class MalformedPropertyList final : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// Can be moved but not copied.
class PropertyList {
 public:
  /// The index of a value in `values`.
  using Index = std::uint32_t;
  /// How deep values may be nested. A number by itself is 1 deep, an array of numbers 2.
  static constexpr std::size_t kMaximumDepth = 512;

  /// A reference to another object of a keyed archive.
  struct Reference {
    std::uint64_t number;
    bool operator==(const Reference&) const = default;
  };
  /// Valid UTF-8.
  using Text = std::string;
  using Array = std::vector<Index>;
  /// Pairs of a key and a value, in the order of the file. Keys are texts, and no two are equal.
  using Dictionary = std::vector<std::pair<Index, Index>>;

  /// A value. An integer is a std::uint64_t only if it is too large for std::int64_t.
  struct Value : std::variant<bool, std::int64_t, std::uint64_t, double, Text, Reference, Array, Dictionary> {
    using variant::variant;
    Value(Value&&) noexcept = default;
    Value& operator=(Value&&) noexcept = default;
  };

  std::vector<Value> values;
  Index root = 0;

  PropertyList() = default;
  PropertyList(PropertyList&&) noexcept = default;
  PropertyList& operator=(PropertyList&&) noexcept = default;

  /// Appends `value` and returns its index.
  Index add(Value value);

  /// Returns the value at `index` if there is one and it is a T, and null otherwise.
  template <class T>
  const T* get(Index index) const noexcept {
    return index < values.size() ? std::get_if<T>(&values[index]) : nullptr;
  }

  /// Returns the index of the value under `key` in the dictionary at `dictionary`. Returns nullopt if there
  /// is no such key, or if the value at `dictionary` is not a dictionary.
  std::optional<Index> find(Index dictionary, std::string_view key) const noexcept;

  /// Reads `bytes`. Throws MalformedPropertyList if they are not a whole property list. It also does so if a
  /// collection contains itself, is nested deeper than `kMaximumDepth` or has a key twice. It refuses a null
  /// as well, which no writer puts in a property list.
  static PropertyList decoded(std::span<const std::byte> bytes);

  /// Returns the property list as bytes. The same values in the same order give the same bytes. Throws
  /// std::invalid_argument if `decoded` would refuse the bytes.
  std::vector<std::byte> encoded() const;

 private:
  // Returns what is wrong with the indexes of collections, or null.
  const char* structuralError() const;
  bool hasRepeatedKey() const;
};

}  // namespace rt
