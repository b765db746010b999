#pragma once

/// User defaults: settings of one application for one user. The application reads them, and people and
/// other programs change them while it runs.
///
///     rt::Ref<rt::UserDefaults> defaults = rt::UserDefaults::standardUserDefaults();
///     if (defaults->boolForKey("ZEBVerboseLogging")) ...
///
///     rt::UserDefaults::Observation observation = defaults->observe(
///         "ZEBVerboseLogging", rt::UserDefaults::Notify::kAlsoNow,
///         [weak = rt::Weak<Account>(account)] { if (auto account = weak.lock()) account->readAgain(); });
///
/// The settings are in one text file, one `key = value` a line (Runtime/Defaults/DefaultsText.h), which
/// people may edit at any time:
///
///     | $XDG_CONFIG_HOME/APPLICATION/defaults.conf, where that is not set ~/.config/...
///     | ~/Library/Application Support/APPLICATION/defaults.conf on macOS
///
/// APPLICATION is the main bundle's identifier or, without one, the process's name. Each read sees what is
/// in the file at that moment: it asks the system whether the file has changed, which takes about a
/// microsecond, and reads it again only if so. No file is no settings. A file that is malformed or cannot
/// be read is reported once, in one line; until it is repaired, what was read last stands.
///
/// To change a setting, write a file beside it and rename that to `defaults.conf`: no reader then sees half a
/// file. With the first observation a thread starts that waits for changes; where the system stops telling it
/// of them, that is reported, and it tries each second to hear of them again. Nothing is started or read
/// before a first use. The child of a fork goes on with what the parent had, but has no such thread until it
/// observes something itself.
///
/// Any thread may use all of it. No lock is held while an observer or the report handler runs.
///
/// Not for: secrets; large or many values; what changes more often than people change their mind.

#include <cstdint>
#include <memory>
#include <string_view>
#include <utility>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Block.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"

namespace rt {

namespace detail {
class DefaultsStore;
struct DefaultsObserver;
}  // namespace detail

class RT_VISIBLE UserDefaults final : public Implements<UserDefaults, Object> {
 public:
  /// When an observer is called.
  enum class Notify : std::uint8_t {
    /// After each change.
    kOnChange,
    /// Once before `observe` returns, on the same thread, and after each change.
    kAlsoNow,
  };

  /// Keeps an observer, and the user defaults, in place for as long as it lives.
  class [[nodiscard]] Observation {
   public:
    /// Of nothing.
    Observation() noexcept = default;
    Observation(Observation&& other) noexcept = default;
    Observation& operator=(Observation&& other) noexcept;
    ~Observation() { remove(); }

    /// Ends the observation: when this returns, the observer is not running and never will again, except
    /// where it is the observer itself that calls this. Waits for an observer that runs on another
    /// thread, so do not call it with a lock held that the observer takes, nor have two observers end
    /// each other's observations. Does nothing the second time.
    void remove() noexcept;

    /// Whether there is something that `remove` would end.
    explicit operator bool() const noexcept { return observer_ != nullptr; }

   private:
    friend class UserDefaults;
    Observation(Ref<UserDefaults> defaults, std::shared_ptr<detail::DefaultsObserver> observer) noexcept
        : defaults_(std::move(defaults)), observer_(std::move(observer)) {}

    Ref<UserDefaults> defaults_;
    std::shared_ptr<detail::DefaultsObserver> observer_;
  };

  /// The application's own, made on first use and never destroyed. Where the environment names no folder
  /// (neither HOME nor XDG_CONFIG_HOME is an absolute path, or the process has raised privileges), that is
  /// reported once, and there are no settings. Never null.
  static Ref<UserDefaults> standardUserDefaults();

  /// The settings in the file at `path`, which begins with a slash; null for null, and for a path that does
  /// not or has a NUL in it. Nothing is opened yet.
  static Ref<UserDefaults> initWithPath(const String& path);

  /// Has `handler` called, instead of standard error written to, with each report: one line without its
  /// end. Null brings standard error back. It is called on the thread that came upon what it reports, and
  /// must not throw.
  static void setReportHandler(Block<void(const String&)> handler);

  ~UserDefaults() override;

  /// Whether the value is "yes", "true", "on", "y" or "t", in letters of either case, or a number that is
  /// not 0 and nothing else. False for all others, and when there is none.
  bool boolForKey(std::string_view key) const;

  /// The value as it is written; null when there is none.
  String stringForKey(std::string_view key) const;

  /// Calls `observer`, not null, on a thread of these user defaults when the value of `key` has become
  /// another; a key without a value counts as one. Observers are called in the order in which they came.
  /// Calls for one observation do not overlap. Where values follow each other quickly some may be left out,
  /// but not the last: read the value in the observer.
  ///
  /// An exception that leaves the observer within `observe` passes to its caller, and nothing is observed
  /// then; on the thread of these user defaults it is reported. Where the system refuses to watch the file,
  /// that is reported, and no change is told of until `observe` is called again. Throws std::bad_alloc.
  Observation observe(std::string_view key, Notify notify, Block<void()> observer);

 private:
  explicit UserDefaults(std::shared_ptr<detail::DefaultsStore> store) noexcept;

  const std::shared_ptr<detail::DefaultsStore> store_;
};

}  // namespace rt
