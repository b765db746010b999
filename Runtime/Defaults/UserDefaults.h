#pragma once

/// User defaults: the settings of one application for one user. The application reads them. People and other
/// programs change them while it runs.
///
///     rt::Ref<rt::UserDefaults> defaults = rt::UserDefaults::standardUserDefaults();
///     if (defaults->boolForKey("ZEBVerboseLogging")) ...
///
///     rt::UserDefaults::Observation observation = defaults->observe(
///         "ZEBVerboseLogging", rt::UserDefaults::Notify::kAlsoNow,
///         [weak = rt::Weak<Account>(account)] { if (auto account = weak.lock()) account->readAgain(); });
///
/// The settings are in a text file. People may edit it at any time:
///
///     | $XDG_CONFIG_HOME/APPLICATION/defaults.conf, or ~/.config/... if that variable is not set
///     | ~/Library/Application Support/APPLICATION/defaults.conf on macOS
///
/// APPLICATION is the main bundle's identifier, or the process's name if there is no identifier. To change
/// a setting from a program, write a file beside `defaults.conf` and rename it. No reader sees half a file
/// then.
///
/// The file has one setting a line:
///
///     | # Written by the operator on call.
///     | ZEBVerboseLogging = YES
///     | greeting = "  two blanks before, one line\n after"   # a remark
///
/// A line is blank, a remark that begins with `#`, or `key = value`. A value ends before a `#` or at the
/// end of the line. Blanks around keys and values do not count. A value may be empty.
///
/// Keys and values may be in double quotes. Between these, \" \\ \n \r \t and \uXXXX (four hexadecimal
/// digits) stand for a character. Quotes are needed for a `#`, for a `=` in a key, and for blanks at an
/// end.
///
/// The text is UTF-8 of at most 1 MiB. Lines end with LF or CR LF. No key comes twice.
///
/// Each read returns what is in the file at that moment. It asks the system whether the file has changed,
/// which takes about a microsecond, and reads the file only if it has. If there is no file, there are no
/// settings. Nothing is opened or started before the first use.
///
/// The first observation starts a thread that waits for changes.
///
/// Errors: a file that is malformed or cannot be read is reported once, in one line. The settings that were
/// read last stay in force until the file is repaired. If the system stops watching the file, that is
/// reported, and the thread tries again each second.
///
/// Threads: any thread may use all of it. No lock is held while an observer or the report handler runs. The
/// child of a fork keeps the parent's settings and observations. It has no thread that waits for changes
/// until it observes a key itself.
///
/// Not for: secrets; large or many values; values that change often.

#include <cstdint>
#include <string_view>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Block.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"

namespace rt {

namespace detail {
class DefaultsObserver;
class DefaultsStore;
}  // namespace detail

class RT_VISIBLE UserDefaults final : public Implements<UserDefaults, Object> {
 public:
  /// Says when an observer is called.
  enum class Notify : std::uint8_t {
    /// After each change.
    kOnChange,
    /// Once within `observe`, on the calling thread, and after each change.
    kAlsoNow,
  };

  /// An observation lasts as long as this object. It retains the user defaults.
  class [[nodiscard]] Observation {
   public:
    /// Makes an object without an observation.
    Observation() noexcept;
    Observation(Observation&& other) noexcept;
    Observation& operator=(Observation&& other) noexcept;
    ~Observation();

    /// Ends the observation. When it returns, the observer is not running and will never run again. The
    /// observer itself may call it, and then runs to its end. Does nothing if there is no observation.
    ///
    /// Threads: waits for an observer that runs on another thread. It deadlocks if the caller holds a lock
    /// that the observer takes, or if two observers end each other's observations.
    void remove() noexcept;

    /// Returns whether there is an observation.
    explicit operator bool() const noexcept { return observer_ != nullptr; }

   private:
    friend class UserDefaults;
    Observation(Ref<UserDefaults> defaults, Ref<detail::DefaultsObserver> observer) noexcept;

    Ref<UserDefaults> defaults_;
    Ref<detail::DefaultsObserver> observer_;
  };

  /// Returns the application's own user defaults. Never null. They are made on first use and never
  /// destroyed.
  ///
  /// Errors: if the environment names no folder, that is reported once and there are no settings. It names
  /// none if neither HOME nor XDG_CONFIG_HOME is an absolute path, or if the process has raised privileges.
  static Ref<UserDefaults> standardUserDefaults();

  /// Returns the user defaults in the file at `path`. Null if `path` is null, does not begin with a slash,
  /// or contains NUL. Opens nothing.
  static Ref<UserDefaults> initWithPath(const String& path);

  /// Sets the handler of reports. A report is one line without its end. The default is null, which writes
  /// reports to standard error. The handler is called on the thread that has found the problem. It must not
  /// throw.
  static void setReportHandler(Block<void(const String&)> handler);

  ~UserDefaults() override;

  /// Returns true if the value is "yes", "true", "on", "y" or "t", in letters of either case, or a decimal
  /// number other than 0. Returns false for any other value, and if there is no value.
  bool boolForKey(std::string_view key) const;

  /// Returns the value as it is in the file. Null if there is no value.
  String stringForKey(std::string_view key) const;

  /// Calls `observer` whenever the value of `key` has changed. It also counts as a change if the value
  /// appears or disappears. Precondition: `observer` is not null. If values follow each other quickly, some
  /// may be skipped, but never the last one. So read the value in the observer.
  ///
  /// Threads: observers run on a thread of these user defaults, in the order in which they were registered.
  /// Calls of one observer do not overlap. If the value changes during the call within `observe`, the same
  /// thread calls the observer again.
  ///
  /// Errors: throws std::bad_alloc. An exception of an observer within `observe` passes to the caller, and
  /// the key is not observed. An exception on the thread of these user defaults is reported. If the system
  /// refuses to watch the file, that is reported, and observers are not called until the next call of
  /// `observe`.
  Observation observe(std::string_view key, Notify notify, Block<void()> observer);

 private:
  explicit UserDefaults(Ref<detail::DefaultsStore> store) noexcept;

  const Ref<detail::DefaultsStore> store_;
};

}  // namespace rt
