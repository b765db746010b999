#include "Runtime/Defaults/UserDefaults.h"

#if __has_include(<xlocale.h>)
#include <xlocale.h>
#endif

#include <algorithm>
#include <array>
#include <clocale>
#include <cmath>
#include <cstdlib>
#include <optional>
#include <string>
#include <utility>

#include "Runtime/Defaults/Private/DefaultsStore.h"
#include "Runtime/Defaults/Private/SystemDefaultsFolder.h"
#include "Runtime/Locks/Private/Lazy.h"
#include "Runtime/Process/Bundle.h"
#include "Runtime/Process/Process.h"

namespace rt {

namespace {

bool isTrueWord(std::string_view text) {
  constexpr std::array<std::string_view, 5> kWords{"yes", "true", "on", "y", "t"};
  const auto isSameLetter = [](char first, char second) { return (first | 0x20) == second; };
  return std::ranges::any_of(
      kWords, [&](std::string_view word) { return std::ranges::equal(text, word, isSameLetter); });
}

// The locale in which numbers are written the same way everywhere. It is never freed.
struct StandardLocale {
  locale_t locale = newlocale(LC_ALL_MASK, "C", nullptr);
};
constinit Lazy<StandardLocale> standardLocale;

bool isNumberOtherThan0(std::string_view text) {
  // The function below also takes leading spaces, hexadecimal digits, "inf" and "nan".
  if (text.find_first_not_of("+-.0123456789eE") != std::string_view::npos) return false;
  // `std::from_chars` would do without a copy, but macOS has it for real numbers since version 26 only.
  const std::string number(text);
  char* end = nullptr;
  const double value =
      strtod_l(number.c_str(), &end, standardLocale.get([] { return StandardLocale(); }).locale);
  return end == number.c_str() + number.size() && value != 0 && std::isfinite(value);
}

Ref<detail::DefaultsStore> standardStore() {
  const std::string folder = detail::systemDefaultsFolder();
  if (folder.empty()) {
    return make<detail::DefaultsStore>(
        "", "there are no user defaults: the environment names no folder for them");
  }
  const String identifier = Bundle::mainIdentifier();
  const String application = identifier.isEmpty() ? Process::name() : identifier;
  const std::string_view name = application.view();
  if (name.empty() || name == "." || name == ".." ||
      name.find_first_of(std::string_view("/\0", 2)) != std::string_view::npos) {
    return make<detail::DefaultsStore>(
        "", "there are no user defaults: the application's name is none for a folder: " + std::string(name));
  }
  return make<detail::DefaultsStore>(folder + "/" + std::string(name) + "/defaults.conf", "");
}

}  // namespace

UserDefaults::UserDefaults(Ref<detail::DefaultsStore> store) noexcept : store_(std::move(store)) {}

UserDefaults::~UserDefaults() {
  store_->stop();
}

Ref<UserDefaults> UserDefaults::standardUserDefaults() {
  static constinit Lazy<Ref<UserDefaults>> standard;
  return standard.get([] { return Ref<UserDefaults>::adopt(new UserDefaults(standardStore())); });
}

Ref<UserDefaults> UserDefaults::initWithPath(const String& path) {
  if (!path.hasPrefix("/") || path.contains(std::string_view("\0", 1))) return nullptr;
  return Ref<UserDefaults>::adopt(
      new UserDefaults(make<detail::DefaultsStore>(std::string(path.view()), "")));
}

void UserDefaults::setReportHandler(Block<void(const String&)> handler) {
  detail::setDefaultsReportHandler(std::move(handler));
}

bool UserDefaults::boolForKey(std::string_view key) const {
  const std::optional<std::string> value = store_->value(key);
  return value && (isTrueWord(*value) || isNumberOtherThan0(*value));
}

String UserDefaults::stringForKey(std::string_view key) const {
  const std::optional<std::string> value = store_->value(key);
  return value ? String::fromUTF8(*value) : String();
}

UserDefaults::Observation UserDefaults::observe(std::string_view key, Notify notify, Block<void()> observer) {
  return {this, store_->observe(key, notify == Notify::kAlsoNow, std::move(observer))};
}

UserDefaults::Observation::Observation() noexcept = default;

UserDefaults::Observation::Observation(Ref<UserDefaults> defaults,
                                       Ref<detail::DefaultsObserver> observer) noexcept
    : defaults_(std::move(defaults)), observer_(std::move(observer)) {}

UserDefaults::Observation::Observation(Observation&& other) noexcept = default;

UserDefaults::Observation& UserDefaults::Observation::operator=(Observation&& other) noexcept {
  if (this != &other) {
    remove();
    defaults_ = std::move(other.defaults_);
    observer_ = std::move(other.observer_);
  }
  return *this;
}

UserDefaults::Observation::~Observation() {
  remove();
}

void UserDefaults::Observation::remove() noexcept {
  const Ref<detail::DefaultsObserver> observer = std::exchange(observer_, nullptr);
  const Ref<UserDefaults> defaults = std::exchange(defaults_, nullptr);
  if (observer != nullptr) defaults->store_->remove(*observer);
}

}  // namespace rt
