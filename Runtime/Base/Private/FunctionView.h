#pragma once

/// A reference to something that can be called, without a copy of it and without an allocation.
///
///     void forEachLine(std::string_view text, rt::FunctionView<void(std::string_view)> visit);
///
///     std::vector<std::string_view> lines;
///     forEachLine("one\ntwo", [&](std::string_view line) { lines.push_back(line); });
///
/// The function must outlive the view. Copying a view is like copying a pointer.
///
/// Threads: several threads may call a view at the same time if they may call its function at the same time.
///
/// Not for: functions that are kept beyond a call (Runtime/Objects/Block.h).

#include <concepts>
#include <type_traits>
#include <utility>

namespace rt {

template <class Signature>
class FunctionView;

template <class Result, class... Arguments>
class FunctionView<Result(Arguments...)> {
 public:
  /// Refers to `function`, an object that can be called.
  template <class Function>
    requires(!std::same_as<std::remove_cvref_t<Function>, FunctionView> &&
             std::is_object_v<std::remove_reference_t<Function>> &&
             std::is_invocable_r_v<Result, Function&, Arguments...>)
  FunctionView(Function&& function) noexcept
      // std::addressof needs <memory>, which took a quarter of the time to parse Runtime/Queues/Queue.h.
      : function_(static_cast<const void*>(__builtin_addressof(function))),
        call_([](const void* called, Arguments... arguments) {
          auto& typed = *static_cast<std::remove_reference_t<Function>*>(const_cast<void*>(called));
          return static_cast<Result>(typed(std::forward<Arguments>(arguments)...));
        }) {}

  Result operator()(Arguments... arguments) const {
    return call_(function_, std::forward<Arguments>(arguments)...);
  }

 private:
  const void* function_;
  Result (*call_)(const void* function, Arguments... arguments);
};

}  // namespace rt
