#include "Runtime/Defaults/UserDefaults.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>
#include <limits>
#include <optional>
#include <string>
#include <system_error>
#include <type_traits>
#include <utility>

#include "Runtime/Defaults/Private/DefaultsStore.h"
#include "Runtime/Defaults/Private/FilePath.h"
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

// The number that `text` begins with, or 0.
template <class Number>
Number leadingNumber(std::string_view text, bool* isWhole = nullptr) {
  const bool isNegative = text.starts_with('-');
  if (text.starts_with('+') && !text.starts_with("+-")) text.remove_prefix(1);
  Number number{};
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
  const bool isAll = end == text.data() + text.size();
  if (isWhole != nullptr) *isWhole = error == std::errc() && isAll;
  if constexpr (std::is_floating_point_v<Number>) {
    // "information" begins with no number, for people.
    if (!std::isfinite(number) && !isAll) number = 0;
  } else if (error == std::errc::result_out_of_range) {
    number = isNegative ? std::numeric_limits<Number>::min() : std::numeric_limits<Number>::max();
  }
  return number;
}

template <class Number>
Number numberOf(const std::optional<std::string>& value) {
  if (!value) return 0;
  return isTrueWord(*value) ? Number{1} : leadingNumber<Number>(*value);
}

template <class Number>
std::string textOf(Number number) {
  std::array<char, 32> text;
  return {text.data(), std::to_chars(text.data(), text.data() + text.size(), number).ptr};
}

std::shared_ptr<detail::DefaultsStore> standardStore() {
  const std::string folder = detail::systemDefaultsFolder();
  if (folder.empty()) {
    return std::make_shared<detail::DefaultsStore>(
        "", "there are no user defaults: the environment names no folder for them");
  }
  const String identifier = Bundle::mainIdentifier();
  const String application = identifier.isEmpty() ? Process::name() : identifier;
  const std::string_view name = application.view();
  if (name.empty() || name == "." || name == ".." ||
      name.find_first_of(std::string_view("/\0", 2)) != std::string_view::npos) {
    return std::make_shared<detail::DefaultsStore>(
        "", "there are no user defaults: the application's name is none for a folder: " + std::string(name));
  }
  return std::make_shared<detail::DefaultsStore>(folder + "/" + std::string(name) + "/defaults.conf", "");
}

}  // namespace

UserDefaults::UserDefaults(std::shared_ptr<detail::DefaultsStore> store) noexcept
    : store_(std::move(store)) {}

UserDefaults::~UserDefaults() {
  store_->stop();
}

Ref<UserDefaults> UserDefaults::standardUserDefaults() {
  static constinit Lazy<Ref<UserDefaults>> standard;
  return standard.get([] { return Ref<UserDefaults>::adopt(new UserDefaults(standardStore())); });
}

Ref<UserDefaults> UserDefaults::initWithPath(const String& path) {
  if (path.isEmpty() || path.contains(std::string_view("\0", 1))) return nullptr;
  // Of one that is relative, what it means now.
  std::string whole = absolutePath(std::string(path.view()));
  return Ref<UserDefaults>::adopt(
      new UserDefaults(std::make_shared<detail::DefaultsStore>(std::move(whole), "")));
}

void UserDefaults::setReportHandler(Block<void(const String&)> handler) {
  detail::setDefaultsReportHandler(std::move(handler));
}

bool UserDefaults::boolForKey(std::string_view key) const {
  const std::optional<std::string> value = store_->value(key);
  if (!value) return false;
  if (isTrueWord(*value)) return true;
  bool isWhole = false;
  const auto number = leadingNumber<double>(*value, &isWhole);
  return isWhole && number != 0 && std::isfinite(number);
}

std::int64_t UserDefaults::integerForKey(std::string_view key) const {
  return numberOf<std::int64_t>(store_->value(key));
}

double UserDefaults::realForKey(std::string_view key) const {
  return numberOf<double>(store_->value(key));
}

String UserDefaults::stringForKey(std::string_view key) const {
  const std::optional<std::string> value = store_->value(key);
  return value ? String::fromUTF8(*value) : String();
}

void UserDefaults::setBool(bool value, std::string_view key) {
  store_->change(key, value ? "YES" : "NO");
}

void UserDefaults::setInteger(std::int64_t value, std::string_view key) {
  store_->change(key, textOf(value));
}

void UserDefaults::setReal(double value, std::string_view key) {
  store_->change(key, textOf(value));
}

void UserDefaults::setString(const String& value, std::string_view key) {
  store_->change(key, value.isNull() ? std::nullopt : std::optional(value.view()));
}

void UserDefaults::remove(std::string_view key) {
  store_->change(key, std::nullopt);
}

UserDefaults::Observation UserDefaults::observe(std::string_view key, Notify notify, Block<void()> observer) {
  return {this, store_->observe(key, notify == Notify::kAlsoNow, std::move(observer))};
}

UserDefaults::Observation& UserDefaults::Observation::operator=(Observation&& other) noexcept {
  if (this != &other) {
    remove();
    defaults_ = std::move(other.defaults_);
    observer_ = std::move(other.observer_);
  }
  return *this;
}

void UserDefaults::Observation::remove() noexcept {
  const auto observer = std::exchange(observer_, nullptr);
  const Ref<UserDefaults> defaults = std::exchange(defaults_, nullptr);
  if (observer != nullptr) defaults->store_->remove(*observer);
}

}  // namespace rt
