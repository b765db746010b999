#pragma once

/// A property list in the binary format "bplist00": read from bytes that nobody vouches for, and written.
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
/// The values stand in one table, in the order of the file; collections refer to their elements by
/// index, so that a value which many collections share is there once, and reading it takes time and
/// memory in proportion to the size of the file, whatever is in it.
///
/// Of the kinds of values that the format has, dates, data and short real numbers are refused: nothing that
/// is archived has any.
///
/// Not for: objects (see Runtime/Archive/KeyedUnarchiver.h); settings that people edit
/// (Runtime/Defaults/UserDefaults.h); property lists as XML.

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

/// The bytes are no property list; `what()` says why, and at which byte.
class MalformedPropertyList final : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// As safe as a vector. Moved, and never copied: what refers to a value has its index.
class PropertyList {
 public:
  /// The place of a value in `values`.
  using Index = std::uint32_t;
  /// How deep values may be nested: a number by itself is 1 deep, an array of numbers 2.
  static constexpr std::size_t kMaximumDepth = 512;

  /// What refers to another object in a keyed archive.
  struct Reference {
    std::uint64_t number;
    bool operator==(const Reference&) const = default;
  };
  /// UTF-8.
  using Text = std::string;
  using Array = std::vector<Index>;
  /// Keys, which are texts and differ from each other, and values, in the order of the file.
  using Dictionary = std::vector<std::pair<Index, Index>>;

  /// An integer is a std::uint64_t only where it is too large for std::int64_t.
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

  /// Appends `value`; returns its index.
  Index add(Value value);

  /// The value at `index` if it is a T, else null.
  template <class T>
  const T* get(Index index) const noexcept {
    return index < values.size() ? std::get_if<T>(&values[index]) : nullptr;
  }

  /// The index of the value under `key` of the dictionary at `dictionary`; none when it has no such key
  /// or is no dictionary.
  std::optional<Index> find(Index dictionary, std::string_view key) const noexcept;

  /// What `bytes` hold. Throws MalformedPropertyList when they are not a whole property list, and when
  /// it has collections that contain themselves, are nested deeper than `kMaximumDepth`, or have a key
  /// twice; also when it has a null, which no writer puts in one.
  static PropertyList decoded(std::span<const std::byte> bytes);

  /// The property list as bytes: the same values and order give the same bytes. Throws
  /// std::invalid_argument where `decoded` would refuse what comes out.
  std::vector<std::byte> encoded() const;

 private:
  // What is wrong with how the values refer to each other, or null.
  const char* structuralError() const;
  bool hasRepeatedKey() const;
};

}  // namespace rt
