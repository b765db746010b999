// There are two ways to an instance: a request, with its quick path to existing instances, and an
// implementation's factory block. Random programs run three times: with requests, with blocks, and with both
// in turns. All must leave the same trace: what was made, for which tags, in which order, what was new, and
// what was reported.

#include <gtest/gtest.h>

#include <array>
#include <bit>
#include <cctype>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <memory>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include "Shared/ServiceRegistry/ServiceRegistry.h"
#include "Shared/ServiceRegistry/Source/Private/SRLRegistryIvars.h"
#include "tests/support/TestBindings.h"
#include "tests/support/TestReports.h"

namespace {

using namespace rt::literals;
using rt::Ref;

enum class Way : std::uint8_t { kRequest, kBlock, kBoth };
enum class Wish : std::uint8_t { kRequired, kOptional, kMany };
enum class Habit : std::uint8_t { kMakes, kMakesNull, kThrows, kAsks, kEndsScopes, kShares };

constexpr std::size_t kMostRecords = 40;
constexpr std::size_t kAPIs = 12;
constexpr std::size_t kByHand = 2;
constexpr int kSteps = 120;
constexpr int kPrograms = 300;

// What a factory throws.
struct Failure {};

class Product final : public rt::Implements<Product, rt::Object> {
 public:
  Product(int theNumber, int theRequest) : number(theNumber), request(theRequest) {}

  const int number;
  // The request that made it.
  const int request;
};

// A registry that gives access to its tables.
class OpenRegistry final : public rt::Implements<OpenRegistry, SRLRegistry> {
 public:
  explicit OpenRegistry(std::unique_ptr<SRLRegistryIvars>&& ivars)
      : OpenRegistry(ivars.get(), std::move(ivars)) {}

  Ref<OpenRegistry> duplicate() const RT_NO_THREAD_SAFETY_ANALYSIS {
    return rt::make<OpenRegistry>(std::make_unique<SRLRegistryIvars>(*known_));
  }

  // Returns the implementations of a multi-bound API. Null if no module knows it.
  Ref<rt::Set> manyBoundTo(const SRLAPIRegistrationData& api) RT_NO_THREAD_SAFETY_ANALYSIS {
    const rt::LockGuard guard(*lock());
    const bool isKnown = known_->multiBindings.find(&api) != nullptr;
    return isKnown || lazilyRegisterBindingsForAPI(&api) ? known_->multiBindings[&api] : nullptr;
  }

  bool isRegistered() const { return known_->bindingsState == SRLBindingsState::kRegistered; }

 private:
  OpenRegistry(SRLRegistryIvars* known, std::unique_ptr<SRLRegistryIvars>&& ivars)
      : Implements(std::move(ivars)), known_(known) {}

  SRLRegistryIvars* const known_;
};

// Replaces addresses, which differ from run to run.
std::string withoutAddresses(const std::string& text) {
  std::string kept;
  for (std::size_t at = 0; at < text.size();) {
    if (text.compare(at, 2, "0x") != 0) {
      kept += text[at++];
      continue;
    }
    for (at += 2; at < text.size() && std::isxdigit(static_cast<unsigned char>(text[at])) != 0;) ++at;
    kept += "ADDRESS";
  }
  return kept;
}

class Program;
Program* running = nullptr;

template <std::size_t Record>
Ref<rt::Object> makeProduct(SRLScopeTagSet tags);

template <std::size_t... Records>
constexpr auto factoriesOf(std::index_sequence<Records...>) {
  return std::array{&makeProduct<Records>...};
}

class Program {
 public:
  Program(unsigned seed, Way way) : random_(seed), ways_(seed + 1), way_(way) {
    running = this;
    for (const char* text : {"account", "window", "thread"}) {
      tags_.emplace_back(rt::String::fromUTF8(text).object());
      tags_.emplace_back(rt::String::fromUTF8(text).object());
    }
    for (std::size_t api = 0; api < kAPIs; ++api) bind(api);
  }
  Program(const Program&) = delete;
  Program& operator=(const Program&) = delete;
  ~Program() {
    SRLRegistry::setSharedInstance(before_);
    running = nullptr;
  }

  std::vector<std::string> trace() {
    step();
    module_ = std::make_unique<TestModule>(bindings_);
    registries_[0]->internalRegisterBindings(std::array{module_->data()});
    bindByHand();
    for (int i = 0; i < kSteps; ++i) step();
    noteReports();
    return std::move(trace_);
  }

  Ref<rt::Object> make(std::size_t record, const SRLScopeTagSet& tags) {
    noteReports();
    std::string line = "make " + std::to_string(record) + " for";
    for (const rt::Object* tag : tags.tags) {
      if (tag != nullptr) line += " " + std::string(tag->description().view());
    }
    trace_.push_back(line);
    const int request = requests_.back();
    switch (habits_[record]) {
      case Habit::kMakesNull:
        lastNull_ = request;
        return nullptr;
      case Habit::kThrows:
        throw Failure();
      case Habit::kAsks:
        ask(shared_, targets_[record]);
        break;
      case Habit::kEndsScopes:
        endScopes();
        break;
      case Habit::kShares:
        share();
        break;
      case Habit::kMakes:
        break;
    }
    return rt::make<Product>(made_++, request);
  }

 private:
  std::uint32_t upTo(std::uint32_t count) { return static_cast<std::uint32_t>(random_() % count); }

  // Returns the scope of an implementation for `api`. Most are a part of the API's scope.
  SRLScopeType scopeFor(const SRLAPIRegistrationData& api) {
    if (upTo(8) == 0) return upTo(16);
    return upTo(2) == 0 ? api.scopeType : api.scopeType & upTo(16);
  }

  Wish wishFor(const SRLAPIRegistrationData& api) {
    if (api.isMultibound != 0) return Wish::kMany;
    return upTo(2) == 0 ? Wish::kOptional : Wish::kRequired;
  }

  // Returns an implementation for an API. Most fit the API. Some are those of another API.
  const SRLImplementationRegistrationData* implement(std::size_t api) {
    if (records_.size() == kMostRecords || (!records_.empty() && upTo(6) == 0)) {
      return &records_[upTo(static_cast<std::uint32_t>(records_.size()))];
    }
    static constexpr auto kFactories = factoriesOf(std::make_index_sequence<kMostRecords>());
    constexpr std::array kHabits = {Habit::kMakes,     Habit::kMakes, Habit::kMakes, Habit::kMakes,
                                    Habit::kMakesNull, Habit::kAsks,  Habit::kAsks,  Habit::kEndsScopes,
                                    Habit::kThrows,    Habit::kShares};
    const std::size_t record = records_.size();
    Habit habit = kHabits[upTo(kHabits.size())];
    // A service requests only earlier ones, so that there is no cycle.
    if (habit == Habit::kAsks && api == 0) habit = Habit::kMakes;
    habits_.push_back(habit);
    targets_.push_back(api == 0 ? 0 : upTo(static_cast<std::uint32_t>(api)));
    const SRLScopeType scope = scopeFor(apis_[api]);
    names_.push_back("Implementation" + std::to_string(record));
    return &records_.emplace_back(
        SRLImplementationRegistrationData{.identifier = names_.back().c_str(),
                                          .instanceType = {.className = "Product"},
                                          .factory = kFactories[record],
                                          .scopeType = scope,
                                          .lifetime = static_cast<std::uint32_t>(upTo(3) == 0)});
  }

  void bind(std::size_t api) {
    const std::string& name = names_.emplace_back("API" + std::to_string(api));
    // The APIs that are bound by hand are single-bound.
    const bool isMany = api < kAPIs - kByHand && upTo(3) == 0;
    apis_.push_back({.identifier = name.c_str(),
                     .instanceType = {.names = {.protocolName = nullptr, .className = "Product"}},
                     .scopeType = upTo(16),
                     .identifierLength = static_cast<std::uint16_t>(name.size()),
                     .isMultibound = static_cast<std::uint16_t>(isMany)});
    if (api >= kAPIs - kByHand) return;
    auto& list = lists_.emplace_back();
    for (std::uint32_t count = isMany ? upTo(6) : (upTo(8) + 6) / 7; count > 0; --count) {
      list.push_back(implement(api));
    }
    list.push_back(nullptr);
    bindings_.push_back({&apis_[api], list.data()});
  }

  // Binds an implementation with a block of its own, and one with a block that the registry made.
  void bindByHand() {
    const SRLAPIRegistrationData& own = apis_[kAPIs - 2];
    const SRLAPIRegistrationData& made = apis_[kAPIs - 1];
    const SRLImplementationRegistrationData* record = implement(kAPIs - kByHand);
    const SRLFactoryBlock block = [record](const SRLScopeTagSet& tags, bool* instanceCreated) {
      if (instanceCreated != nullptr) *instanceCreated = true;
      return record->factory(tags);
    };
    const std::uint64_t lifetime = upTo(4);
    const SRLFactoryBlock scoped = registries_[0]->scopedBlockForFactory(
        record->factory, record, made.scopeType, record->scopeType & made.scopeType, lifetime);
    const auto implementation = [](const SRLFactoryBlock& factoryBlock) {
      return SRLImplementation::initWithIdentifier("ByHand", nullptr, 0, 0, factoryBlock, nullptr);
    };
    OpenRegistry& registry = *registries_[0];
    const rt::LockGuard guard(*registry.lock());
    registry.internalRegisterServiceAPI(&own, implementation(block));
    registry.internalRegisterServiceAPI(&made, implementation(scoped));
  }

  void step() {
    switch (upTo(16)) {
      case 0:
        endScopes();
        break;
      case 1:
        share();
        break;
      case 2:
        registries_[1] = registries_[0]->duplicate();
        break;
      default:
        ask(upTo(2), upTo(kAPIs));
    }
  }

  void endScopes() {
    const Ref<rt::Object>& tag = tags_[upTo(6)];
    if (registries_[shared_]) registries_[shared_]->removeScopesWithTag(tag);
  }

  void share() {
    shared_ = upTo(8) == 0 ? 2 : upTo(2);
    SRLRegistry::setSharedInstance(registries_[shared_]);
  }

  void ask(std::size_t of, std::size_t apiNumber) {
    const SRLAPIRegistrationData& api = apis_[apiNumber];
    SRLScopeTagSet tags;
    const std::uint32_t count =
        upTo(10) == 0 ? upTo(5) : static_cast<std::uint32_t>(std::popcount(api.scopeType));
    for (std::uint32_t i = 0; i < count; ++i) tags.tags[i] = tags_[upTo(6)].get();
    const Wish wish = wishFor(api);
    const Ref<OpenRegistry> registry = registries_[of];
    if (!registry) return;
    requests_.push_back(++lastRequest_);
    trace_.push_back("ask " + std::to_string(of) + " for " + std::to_string(apiNumber));
    try {
      const bool byBlock = way_ == Way::kBlock || (way_ == Way::kBoth && ways_() % 2 == 0);
      byBlock ? askByBlock(*registry, api, tags, wish) : askByRequest(*registry, api, tags, wish);
    } catch (const Failure&) {
      noteReports();
      trace_.emplace_back("thrown");
    }
    requests_.pop_back();
  }

  void askByRequest(OpenRegistry& registry, const SRLAPIRegistrationData& api, const SRLScopeTagSet& tags,
                    Wish wish) {
    const int request = requests_.back();
    const auto isNew = [&](const Ref<rt::Object>& instance) {
      return instance ? static_cast<const Product&>(*instance).request == request : lastNull_ == request;
    };
    if (wish == Wish::kMany) {
      const Ref<rt::Array> instances = registry.internalMultiBoundService(&api, tags);
      noteReports();
      if (!instances) {
        trace_.emplace_back("none");
        return;
      }
      for (const Ref<rt::Object>& instance : *instances) note(instance, isNew(instance));
      return;
    }
    const Ref<rt::Object> instance = wish == Wish::kRequired ? registry.internalService(&api, tags)
                                                             : registry.internalOptionalService(&api, tags);
    noteReports();
    note(instance, isNew(instance));
  }

  void askByBlock(OpenRegistry& registry, const SRLAPIRegistrationData& api, const SRLScopeTagSet& tags,
                  Wish wish) {
    if (wish == Wish::kMany) {
      const Ref<rt::Set> implementations = registry.manyBoundTo(api);
      noteReports();
      if (!implementations) {
        trace_.emplace_back("none");
        return;
      }
      std::vector<std::pair<Ref<rt::Object>, bool>> instances;
      for (const Ref<rt::Object>& element : *implementations) {
        const auto& implementation = static_cast<const SRLImplementation&>(*element);
        bool isNew = false;
        Ref<rt::Object> instance = implementation.factoryBlock()(tags, &isNew);
        noteReports();
        if (instance) {
          instances.emplace_back(std::move(instance), isNew);
        } else {
          noteNull(implementation, "multi-bound", api);
        }
      }
      for (const auto& [instance, isNew] : instances) note(instance, isNew);
      return;
    }
    const Ref<SRLImplementation> implementation = boundTo(api, &registry);
    noteReports();
    bool isNew = false;
    Ref<rt::Object> instance;
    if (implementation) {
      instance = implementation->factoryBlock()(tags, &isNew);
      noteReports();
      if (!instance && wish == Wish::kRequired) noteNull(*implementation, "required", api);
    } else if (wish == Wish::kRequired) {
      trace_.push_back((registry.isRegistered()
                            ? "No binding was found for required, single-bound service: "
                            : "A service injector was called prior to service bindings being registered.\n\n"
                              "Service: ") +
                       std::string(api.identifier));
    }
    note(instance, isNew);
  }

  void note(const Ref<rt::Object>& instance, bool isNew) {
    const std::string number =
        instance ? std::to_string(static_cast<const Product&>(*instance).number) : "null";
    trace_.push_back((isNew ? "new " : "kept ") + number);
  }

  void noteNull(const SRLImplementation& implementation, const std::string& kind,
                const SRLAPIRegistrationData& api) {
    const Ref<SRLInstanceType>& type = implementation.instanceType();
    const rt::String typeText = type ? type->asObject()->description() : "(null)"_s;
    trace_.push_back(withoutAddresses(
        "Implementation of " + std::string(typeText.view()) + ", bound to " + kind + " service " +
        api.identifier + ", returned nil.\nImplementation metadata: " +
        std::string(implementation.description().view()) + "\nSee docs/registry.md#initializer-return-nil."));
  }

  void noteReports() {
    for (const std::string& text : reports_.texts()) trace_.push_back(withoutAddresses(text));
  }

  std::mt19937 random_;
  std::mt19937 ways_;
  const Way way_;

  TestReports reports_;
  std::deque<std::string> names_;
  std::deque<SRLImplementationRegistrationData> records_;
  std::vector<Habit> habits_;
  std::vector<std::size_t> targets_;
  std::deque<SRLAPIRegistrationData> apis_;
  std::deque<std::vector<const SRLImplementationRegistrationData*>> lists_;
  std::vector<_SRLBindingRegistrationData> bindings_;
  std::unique_ptr<TestModule> module_;
  std::vector<Ref<rt::Object>> tags_;

  std::vector<std::string> trace_;
  std::vector<int> requests_;
  int lastRequest_ = 0;
  int lastNull_ = 0;
  int made_ = 0;

  // A registry, a copy of it, and null. `shared_` says which of them is shared.
  const Ref<OpenRegistry> first_ = rt::make<OpenRegistry>(std::make_unique<SRLRegistryIvars>());
  std::array<Ref<OpenRegistry>, 3> registries_{first_, first_->duplicate()};
  std::size_t shared_ = 0;
  const Ref<SRLRegistry> before_ = SRLRegistry::setSharedInstance(first_);
};

template <std::size_t Record>
Ref<rt::Object> makeProduct(SRLScopeTagSet tags) {
  return running->make(Record, tags);
}

TEST(SRLRegistryWays, LeaveEqualTraces) {
  std::size_t countKept = 0;
  std::size_t countReports = 0;
  for (unsigned seed = 0; seed < kPrograms; ++seed) {
    const std::vector<std::string> trace = Program(seed, Way::kRequest).trace();
    ASSERT_EQ(trace, Program(seed, Way::kBlock).trace()) << "seed " << seed;
    ASSERT_EQ(trace, Program(seed, Way::kBoth).trace()) << "seed " << seed;
    for (const std::string& line : trace) {
      if (line.starts_with("kept ") && line != "kept null") ++countKept;
      if (line.find("scope") != std::string::npos) ++countReports;
    }
  }
  // Programs that do nothing would have equal traces, too.
  EXPECT_GT(countKept, 1000U);
  EXPECT_GT(countReports, 1000U);
}

}  // namespace
