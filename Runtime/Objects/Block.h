#pragma once

/// A function with what it captured, shared by reference: null or counted, one pointer.
///
///     rt::Block<int(int)> twice = [](int value) { return 2 * value; };
///     rt::Block<void()> log = [message = std::move(message)] { print(message); };
///     if (log) log();
///     rt::Block<int(int)> same = twice;         // one more reference; same == twice
///
/// Made from a lambda, another callable object or a pointer to a function; what is captured need only be
/// movable. A copy is another reference to the same block, and two blocks are equal if they are the same
/// one. A callable object that captures nothing makes the same block each time, without allocating or
/// counting.
///
/// A call keeps the block alive until it returns, also when the variable that it was called through is
/// replaced meanwhile. Calling null ends the program with a line on standard error. An exception passes
/// through. Different `Block` objects may be used by different threads at once, and the same block may be
/// called by several threads at once if what it does allows that; one `Block` object is as safe as a
/// plain pointer.
///
/// Not for: parameters that are only called during the call, which may be templates; cycles (an object
/// that keeps a block which captures the object: capture a `Weak`).

#include <concepts>
#include <cstddef>
#include <functional>
#include <string_view>
#include <type_traits>
#include <typeinfo>
#include <utility>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"

namespace rt {

namespace detail {

/// The class of what blocks refer to.
class RT_VISIBLE BlockObject : public Implements<BlockObject, Object> {
 public:
  static constexpr std::string_view kClassName = "Block";

 protected:
  using Implements::Implements;
  constexpr BlockObject() noexcept = default;
};

template <class Result, class... Arguments>
class BlockBody : public BlockObject {
 public:
  virtual Result call(Arguments... arguments) const = 0;

 protected:
  using BlockObject::BlockObject;
  constexpr BlockBody() noexcept = default;
};

/// A block with a function object of its own.
template <class Function, class Result, class... Arguments>
class CapturingBlock final : public BlockBody<Result, Arguments...> {
 public:
  template <class From>
  CapturingBlock(std::in_place_t, From&& function) : function_(std::forward<From>(function)) {}

  Result call(Arguments... arguments) const override {
    return static_cast<Result>(std::invoke(function_, std::forward<Arguments>(arguments)...));
  }

  const Function& function() const noexcept { return function_; }

 private:
  mutable Function function_;
};

/// A block of a function object without state: a constant, since any object of its type will do.
template <class Function, class Result, class... Arguments>
class ConstantBlock final : public BlockBody<Result, Arguments...> {
 public:
  constexpr ConstantBlock() noexcept : BlockBody<Result, Arguments...>(Object::Immortal()) {}
  constexpr ~ConstantBlock() override {}  // NOLINT(modernize-use-equals-default): g++ needs it; never called

  Result call(Arguments... arguments) const override {
    return static_cast<Result>(Function()(std::forward<Arguments>(arguments)...));
  }
};

template <class Function, class Result, class... Arguments>
inline constexpr ConstantBlock<Function, Result, Arguments...> kConstantBlock;

template <class Function>
concept Stateless = std::is_empty_v<Function> && std::is_trivially_default_constructible_v<Function>;

[[noreturn, gnu::cold]] void trapOnNullBlock() noexcept;

}  // namespace detail

template <class Signature>
class Block;

template <class Result, class... Arguments>
class Block<Result(Arguments...)> {
 public:
  /// Null.
  constexpr Block() noexcept = default;
  constexpr Block(std::nullptr_t) noexcept {}

  /// A block that calls `function` with what it is called with, from any `const` or other context.
  /// Takes `function` over; null if it is a null pointer. Throws std::bad_alloc, and what moving or
  /// copying `function` throws; neither if it is stateless.
  template <class Function>
    requires(!std::same_as<std::remove_cvref_t<Function>, Block> &&
             std::is_invocable_r_v<Result, std::decay_t<Function>&, Arguments...>)
  Block(Function&& function) {
    using Stored = std::decay_t<Function>;
    if constexpr (detail::Stateless<Stored>) {
      body_ = &detail::kConstantBlock<Stored, Result, Arguments...>;
    } else {
      using Given = std::remove_cvref_t<Function>;
      if constexpr (std::is_pointer_v<Given> || std::is_member_pointer_v<Given>) {
        if (function == nullptr) return;
      }
      body_ = Ref<const Body>::adopt(new detail::CapturingBlock<Stored, Result, Arguments...>(
          std::in_place, std::forward<Function>(function)));
    }
  }

  /// Calls the block, which must not be null, and keeps it alive until it returns.
  Result operator()(Arguments... arguments) const {
    const Ref<const Body> body = body_;
    if (!body) [[unlikely]]
      detail::trapOnNullBlock();
    return body->call(std::forward<Arguments>(arguments)...);
  }

  /// The same for a caller who knows that something keeps the block until it returns, such as a constant
  /// member of an object that the caller has a reference to. Spares the count.
  Result callKept(Arguments... arguments) const {
    if (!body_) [[unlikely]]
      detail::trapOnNullBlock();
    return body_->call(std::forward<Arguments>(arguments)...);
  }

  /// The callable object that the block was made from, if it is a `Function` with state; null otherwise, and
  /// for null. The block owns it.
  template <class Function>
  const Function* target() const noexcept {
    using Made = detail::CapturingBlock<Function, Result, Arguments...>;
    if (!body_ || typeid(*body_) != typeid(Made)) return nullptr;
    return &static_cast<const Made&>(*body_).function();
  }

  explicit operator bool() const noexcept { return body_ != nullptr; }

  /// Whether both are the same block, or both are null.
  friend bool operator==(const Block&, const Block&) noexcept = default;
  friend bool operator==(const Block& block, std::nullptr_t) noexcept { return !block; }

  /// The block as an object, equal to itself only; null for null. For where objects are kept.
  Ref<Object> object() const noexcept { return const_cast<Body*>(body_.get()); }

 private:
  using Body = detail::BlockBody<Result, Arguments...>;

  Ref<const Body> body_;
};

}  // namespace rt
