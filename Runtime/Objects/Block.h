#pragma once

/// `rt::Block` is a function with its captured values, shared by reference. It is one pointer, null or
/// counted.
///
///     rt::Block<int(int)> twice = [](int value) { return 2 * value; };
///     rt::Block<void()> log = [message = std::move(message)] { print(message); };
///     if (log) log();
///     rt::Block<int(int)> same = twice;         // one more reference; same == twice
///
/// A block is made from a lambda, another callable object or a pointer to a function. Captured values need
/// only be movable. A copy is another reference to the same block. Two blocks are equal if they are the same
/// block. A callable object without state makes the same block each time. Such a block neither allocates nor
/// counts.
///
/// A call keeps the block alive until it returns, even if its variable is replaced meanwhile. Calling a null
/// block ends the program with a line on standard error. An exception passes through.
///
/// Threads: threads may use different `Block` objects at the same time. Several threads may call the same
/// block at once if its function allows that. One `Block` object is as thread-safe as a plain pointer.
///
/// Not for: parameters that a function only calls before it returns, which may be templates; cycles. A block
/// that captures the object that keeps it is a cycle: capture a `Weak`.

#include <concepts>
#include <cstddef>
#include <string_view>
#include <type_traits>
#include <utility>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"

namespace rt {

namespace detail {

// The class of the objects that blocks refer to.
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
  // Identifies the type of a captured function object. Not typeid: hosts may be compiled without it.
  virtual const void* functionType() const noexcept { return nullptr; }

 protected:
  using BlockObject::BlockObject;
  constexpr BlockBody() noexcept = default;
};

// Has one address for each type of function object.
template <class Function>
inline constexpr char kFunctionType = 0;

// A block with a function object of its own.
template <class Function, class Result, class... Arguments>
class CapturingBlock final : public BlockBody<Result, Arguments...> {
 public:
  template <class From>
  CapturingBlock(std::in_place_t, From&& function) : function_(std::forward<From>(function)) {}

  Result call(Arguments... arguments) const override {
    return static_cast<Result>(function_(std::forward<Arguments>(arguments)...));
  }

  const void* functionType() const noexcept override { return &kFunctionType<Function>; }
  const Function& function() const noexcept { return function_; }

 private:
  mutable Function function_;
};

// A block of a function object without state. It is a constant, since all objects of such a type do the
// same.
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
  /// Makes a null block.
  constexpr Block() noexcept = default;
  constexpr Block(std::nullptr_t) noexcept {}

  /// Makes a block that calls `function` with the block's arguments. Moves or copies `function` into the
  /// block. Calls may change its state, also through a `const` block. Null if `function` is a null pointer.
  /// Throws std::bad_alloc and what moving or copying `function` throws. Throws nothing if `function` has no
  /// state.
  template <class Function>
    requires(!std::same_as<std::remove_cvref_t<Function>, Block> &&
             !std::is_member_pointer_v<std::decay_t<Function>> &&
             std::is_invocable_r_v<Result, std::decay_t<Function>&, Arguments...>)
  Block(Function&& function) {
    using Stored = std::decay_t<Function>;
    if constexpr (detail::Stateless<Stored>) {
      body_ = &detail::kConstantBlock<Stored, Result, Arguments...>;
    } else {
      using Given = std::remove_cvref_t<Function>;
      if constexpr (std::is_pointer_v<Given>) {
        if (function == nullptr) return;
      }
      body_ = Ref<const Body>::adopt(new detail::CapturingBlock<Stored, Result, Arguments...>(
          std::in_place, std::forward<Function>(function)));
    }
  }

  /// Calls the block, which must not be null. Keeps it alive until it returns.
  Result operator()(Arguments... arguments) const {
    const Ref<const Body> body = body_;
    if (!body) [[unlikely]]
      detail::trapOnNullBlock();
    return body->call(std::forward<Arguments>(arguments)...);
  }

  /// Calls the block without counting a reference. Precondition: something keeps the block alive until the
  /// call returns. An example is a constant member of an object that the caller has a reference to.
  Result callKept(Arguments... arguments) const {
    if (!body_) [[unlikely]]
      detail::trapOnNullBlock();
    return body_->call(std::forward<Arguments>(arguments)...);
  }

  /// Returns the callable object that the block was made from, if it is a `Function` with state. Null
  /// otherwise, for a null block, and if another shared library that hides its symbols made the block.
  /// Ownership: the block's.
  template <class Function>
  const Function* target() const noexcept {
    using Made = detail::CapturingBlock<Function, Result, Arguments...>;
    if (!body_ || body_->functionType() != &detail::kFunctionType<Function>) return nullptr;
    return &static_cast<const Made&>(*body_).function();
  }

  explicit operator bool() const noexcept { return body_ != nullptr; }

  /// Returns whether both are the same block, or both are null.
  friend bool operator==(const Block&, const Block&) noexcept = default;
  friend bool operator==(const Block& block, std::nullptr_t) noexcept { return !block; }

  /// Returns the block as an object, for places that keep objects. It is equal only to itself. Null for a
  /// null block.
  Ref<Object> object() const noexcept { return const_cast<Body*>(body_.get()); }

 private:
  using Body = detail::BlockBody<Result, Arguments...>;

  Ref<const Body> body_;
};

}  // namespace rt
