#include "Shared/Logging/LUMLogLevels.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cstddef>
#include <optional>
#include <string_view>
#include <utility>
#include <vector>

#include "Runtime/Defaults/UserDefaults.h"
#include "Runtime/Locks/Private/Lazy.h"
#include "Runtime/Process/Process.h"
#include "Runtime/Text/Format.h"
#include "Shared/Logging/LUMLog.h"

namespace {

using namespace rt::literals;

constexpr const char* kName = "LUM_LOG";

std::string_view trimmed(std::string_view text) {
  const std::size_t start = text.find_first_not_of(' ');
  return start == std::string_view::npos ? text.substr(text.size())
                                         : text.substr(start, text.find_last_not_of(' ') + 1 - start);
}

std::optional<LUMLogLevel> levelOf(std::string_view text) {
  struct Named {
    std::string_view name;
    LUMLogLevel level;
  };
  constexpr std::array kLevels = {Named{"all", 0},
                                  Named{"debug", LUMLogLevelDebug},
                                  Named{"info", LUMLogLevelInfo},
                                  Named{"error", LUMLogLevelError},
                                  Named{"fault", LUMLogLevelFault},
                                  Named{"off", LUMLogLevelNone}};
  const auto* const named = std::ranges::find(kLevels, text, &Named::name);
  if (named != kLevels.end()) return named->level;
  LUMLogLevel level = 0;
  const char* const end = text.data() + text.size();
  const auto [stopped, error] = std::from_chars(text.data(), end, level);
  if (text.empty() || stopped != end || error != std::errc()) return std::nullopt;
  return level;
}

// The text of the environment variable, or else of the user default. Null if there is none.
rt::String outerText() {
  const rt::String text = rt::Process::environmentValue(kName);
  return text ? text : rt::UserDefaults::standardUserDefaults()->stringForKey(kName);
}

}  // namespace

// What a text says. Immutable.
class LUMLogLevels::Table final : public rt::Implements<Table, rt::Object> {
 public:
  static constexpr std::string_view kClassName = "LUMLogLevelsTable";

  // Reads `text`. `problem` becomes a sentence if the text is malformed. It names the text by `name`.
  Table(rt::String text, const char* name, rt::String& problem) : text_(std::move(text)) {
    const std::string_view whole = text_.view();
    if (trimmed(whole).empty()) return;
    for (std::size_t start = 0; start <= whole.size() && !problem;) {
      const std::size_t end = std::min(whole.find(',', start), whole.size());
      const std::string_view part = trimmed(whole.substr(start, end - start));
      if (const char* mistake = add(part)) {
        problem = rt::format("%s, column %tu: \"%@\" %s"_s, name, part.data() - whole.data() + 1,
                             rt::String::fromUTF8Repaired(part), mistake);
      }
      start = end + 1;
    }
    // The first part that fits a component counts: the longest, and the later one of two that are equal.
    std::ranges::sort(parts_, [](const Part& first, const Part& second) {
      if (first.isBeginning != second.isBeginning) return second.isBeginning;
      if (first.name.size() != second.name.size()) return first.name.size() > second.name.size();
      return first.name.data() > second.name.data();
    });
  }

  LUMLogLevel lowestOf(const rt::String& component) const noexcept {
    if (!component) return others_;
    for (const Part& part : parts_) {
      if (part.isBeginning ? component.hasPrefix(part.name) : component == part.name) return part.level;
    }
    return others_;
  }

  LUMLogLevel lowestOfAll() const noexcept {
    LUMLogLevel lowest = others_;
    for (const Part& part : parts_) lowest = std::min(lowest, part.level);
    return lowest;
  }

 private:
  struct Part {
    std::string_view name;
    bool isBeginning;
    LUMLogLevel level;
  };

  // Returns what is wrong with `part`, or null.
  const char* add(std::string_view part) {
    const std::size_t equals = part.rfind('=');
    const bool isForOthers = equals == std::string_view::npos;
    const std::optional<LUMLogLevel> level = levelOf(trimmed(isForOthers ? part : part.substr(equals + 1)));
    if (!level) return "has no level (all, debug, info, error, fault, off or a number)";
    if (isForOthers) {
      others_ = *level;
      return nullptr;
    }
    std::string_view name = trimmed(part.substr(0, equals));
    if (name.empty()) return "has no component";
    const bool isBeginning = name.ends_with('*');
    if (isBeginning) name.remove_suffix(1);
    if (name.find('*') != std::string_view::npos) return "has a star that is not at the end of the component";
    parts_.push_back({name, isBeginning, *level});
    return nullptr;
  }

  const rt::String text_;  // The names are parts of it.
  std::vector<Part> parts_;
  LUMLogLevel others_ = LUMLogLevelInfo;
};

const rt::Ref<LUMLogLevels>& LUMLogLevels::sharedInstance() {
  static constinit rt::Lazy<rt::Ref<LUMLogLevels>> instance;
  static constinit rt::Lazy<rt::UserDefaults::Observation> observation;
  const rt::Ref<LUMLogLevels>& shared = instance.get(init);
  bool isFirst = false;
  observation.get([&] {
    isFirst = true;
    if (rt::Process::environmentValue(kName)) return rt::UserDefaults::Observation();
    return rt::UserDefaults::standardUserDefaults()->observe(
        kName, rt::UserDefaults::Notify::kOnChange,
        [levels = shared.get()] { levels->setOuterText(outerText()); });
  });
  // A mistake in the text is logged here and not above: a logger that gets that message may ask for the
  // shared instance. If the user default changes meanwhile, it is read again.
  for (rt::String read; isFirst; isFirst = read != outerText()) {
    read = outerText();
    shared->setOuterText(read);
  }
  return shared;
}

rt::Ref<LUMLogLevels> LUMLogLevels::init() {
  return rt::Ref<LUMLogLevels>::adopt(new LUMLogLevels);
}

LUMLogLevels::LUMLogLevels() {
  rt::String problem;
  outer_ = rt::make<Table>(""_s, kName, problem);
  current_.exchange(outer_);
}

LUMLogLevels::~LUMLogLevels() = default;

rt::String LUMLogLevels::setText(const rt::String& text) {
  rt::String problem;
  rt::Ref<Table> table = text ? rt::make<Table>(text, "the text", problem) : nullptr;
  if (!problem) setTable(&LUMLogLevels::chosen_, std::move(table));
  return problem;
}

void LUMLogLevels::setOuterText(const rt::String& text) {
  rt::String problem;
  rt::Ref<Table> table = rt::make<Table>(text ? text : ""_s, kName, problem);
  if (problem) {
    // Not LUMLogAt, which would put the path of this file on the building machine into every program.
    constexpr LUMLogArgumentKind kObject = 1;
    LUMLog(LUMLogLevelError, "Shared/Logging/LUMLogLevels.cpp", "LUMLogLevels::setOuterText", __LINE__,
           nullptr, 1, &kObject, "%@"_s, problem.object());
  } else {
    setTable(&LUMLogLevels::outer_, std::move(table));
  }
}

void LUMLogLevels::setTable(rt::Ref<Table> LUMLogLevels::* place, rt::Ref<Table> table) {
  {
    const rt::LockGuard guard(lock_);
    this->*place = std::move(table);
    current_.exchange(chosen_ ? chosen_ : outer_);
  }
  LUMLogInterestChanged();
}

bool LUMLogLevels::allowLogMessage(const LUMLogMessage& message) const {
  const rt::Ref<LUMLogMetadata>& metadata = message.logMetadata();
  return message.level() >= current_.load()->lowestOf(metadata ? metadata->component() : nullptr);
}

LUMLogLevel LUMLogLevels::lowestLevel(const rt::String* component) const noexcept {
  const rt::Ref<Table> table = current_.load();
  return component != nullptr ? table->lowestOf(*component) : table->lowestOfAll();
}
