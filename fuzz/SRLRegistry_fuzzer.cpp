// Compares registries with a model made of maps, for any records and any order of requests. Both must return
// the same instances, from the same factories and tags, and make the same reports. No instance may outlive
// its scope.
#include <fuzzer/FuzzedDataProvider.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Values/Array.h"
#include "Runtime/Values/Set.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLClassType.h"
#include "Shared/ServiceRegistry/Source/SRLRegistry.h"
#include "fuzz/SRLRegistryModel.h"
#include "fuzz/SRLRegistryRecords.h"
#include "tests/support/TestReports.h"

namespace {

using rt::Ref;

void require(bool condition) {
  if (!condition) std::abort();
}

// Performs the operations of an input, on registries and on the model.
class Session {
 public:
  explicit Session(FuzzedDataProvider& data) : data_(data), records_(data), model_(records_) {
    registries_.push_back(SRLRegistry::initPrivate());
    registries_[0]->internalRegisterBindings(records_.datas);
    model_.registries[0].isRegistered = true;
    before_ = SRLRegistry::setSharedInstance(registries_[0]);
    reports_.messages();
  }
  Session(const Session&) = delete;
  Session& operator=(const Session&) = delete;
  ~Session() {
    SRLRegistry::setSharedInstance(before_);
    registries_.clear();
    require(instancesAlive == 0);
  }

  void run() {
    for (int i = 0; i < 80 && data_.remaining_bytes() > 0; ++i) step();
  }

 private:
  void step() {
    const std::size_t at = data_.ConsumeIntegralInRange<std::size_t>(0, registries_.size() - 1);
    const Ref<SRLRegistry>& registry = registries_[at];
    API api = &records_.apis[data_.ConsumeIntegralInRange<std::size_t>(0, records_.apis.size() - 1)];
    const rt::String identifier = rt::String::fromUTF8(api->identifier);
    Expected expected;
    switch (data_.ConsumeIntegralInRange(0, 15)) {
      case 0:
      case 1:
      case 2: {
        const Tags tags = someTags(*api);
        model_.service(at, api, tags, true, expected);
        return check(expected, registry->internalService(api, TagSet(tags).set));
      }
      case 3: {
        const Tags tags = someTags(*api);
        model_.service(at, api, tags, false, expected);
        return check(expected, registry->internalOptionalService(api, TagSet(tags).set));
      }
      case 4:
      case 5: {
        const Tags tags = someTags(*api);
        model_.services(at, api, tags, expected);
        return check(expected, registry->internalMultiBoundService(api, TagSet(tags).set));
      }
      case 6:
        model_.has(at, api, expected);
        return check(expected, registry->internalHasImplementationForService(api));
      case 7: {
        const std::string tag(1, data_.PickValueInArray({'s', 't', 'u'}));
        for (auto scope = model_.registries[at].scopes.begin();
             scope != model_.registries[at].scopes.end();) {
          const bool ends = std::ranges::find(scope->first, tag) != scope->first.end();
          scope = ends ? model_.registries[at].scopes.erase(scope) : std::next(scope);
        }
        registry->removeScopesWithTag(rt::String::fromUTF8(tag));
        return check(expected);
      }
      case 8: {
        const Tags tags = someTags(*api);
        const bool isRequired = data_.ConsumeBool();
        const Ref<SRLScopeTagSetCodableWrapper> wrapper = wrapperOf(tags, expected);
        API found = model_.apiCalled(at, identifier);
        if (!wrapper) {
          expected.isNull = true;
        } else if (found == nullptr) {
          expected.isNull = true;
          if (isRequired) expected.reports.emplace_back("Unknown API %@");
        } else {
          model_.service(at, found, fitting(tags, expected), isRequired, expected);
        }
        return check(expected, isRequired ? registry->eg_internalService(identifier, wrapper)
                                          : registry->eg_internalOptionalService(identifier, wrapper));
      }
      case 9: {
        const Tags tags = someTags(*api);
        const Ref<SRLScopeTagSetCodableWrapper> wrapper = wrapperOf(tags, expected);
        API found = model_.apiCalled(at, identifier);
        expected.isNull = !wrapper;
        if (wrapper && found != nullptr) model_.services(at, found, fitting(tags, expected), expected);
        return check(expected, registry->eg_internalMultiBoundService(identifier, wrapper));
      }
      case 10:
        if (API found = model_.apiCalled(at, identifier); found != nullptr) {
          model_.has(at, found, expected);
        } else {
          expected.reports.emplace_back("Unknown API %@");
        }
        return check(expected, registry->eg_internalHasImplementationForService(identifier));
      case 11: {
        if (registries_.size() >= 4) return;
        ModelRegistry copy = model_.registries[at];
        copy.scopes.clear();
        model_.registries.push_back(std::move(copy));
        registries_.push_back(registry->mutableCopy());
        return check(expected);
      }
      case 12:
        if (registries_.size() >= 4) return;
        model_.registries.emplace_back();
        registries_.push_back(SRLRegistry::initPrivate());
        return check(expected);
      case 13:
        if (model_.registries[at].isRegistered) return;
        model_.registries[at].isRegistered = true;
        registry->internalRegisterBindings(records_.datas);
        return check(expected);
      case 14:
        model_.shared = at;
        SRLRegistry::setSharedInstance(registry);
        return check(expected);
      default: {
        const Tags tags = someTags(*api);
        const auto& scope = model_.registries[at].scopes[tags];
        std::vector<rt::Object*> kept;
        for (const auto& [record, instance] : scope) {
          if (instance != nullptr) kept.push_back(instance);
        }
        require(sorted(registry->scopeWithTags(TagSet(tags).set)->instances()) == sorted(kept));
        return check(expected);
      }
    }
  }

  // A tag set of new objects. Tags are compared by value.
  struct TagSet {
    explicit TagSet(const Tags& tags) {
      for (std::size_t i = 0; i < tags.size(); ++i) {
        objects.at(i) = rt::String::fromUTF8(tags[i]);
        set.tags.at(i) = objects.at(i).get();
      }
    }
    std::array<Ref<rt::Object>, SRLScopeTagSet::kCapacity> objects;
    SRLScopeTagSet set;
  };

  // Returns tags with three possible values. Their number is mostly the one that the API requires.
  Tags someTags(const SRLAPIRegistrationData& api) {
    auto count = static_cast<std::size_t>(std::popcount(api.scopeType));
    if (count > 4 || data_.ConsumeIntegralInRange(0, 7) == 0)
      count = data_.ConsumeIntegralInRange<std::size_t>(0, 4);
    Tags tags;
    for (std::size_t i = 0; i < count; ++i) tags.emplace_back(1, data_.PickValueInArray({'s', 't', 'u'}));
    return tags;
  }

  // Returns a wrapper of `tags`. Sometimes returns null, sometimes a wrapper with one tag too many. `fitting`
  // returns the tags that the registry then uses.
  Ref<SRLScopeTagSetCodableWrapper> wrapperOf(const Tags& tags, Expected& expected) {
    const int kind = data_.ConsumeIntegralInRange(0, 15);
    isTooLong_ = kind == 1;
    if (kind == 0) {
      expected.reports.emplace_back("Missing tag set for service:\n%@.");
      return nullptr;
    }
    std::vector<Ref<rt::Object>> objects;
    for (const std::string& tag : tags) objects.emplace_back(rt::String::fromUTF8(tag));
    while (isTooLong_ && objects.size() < 5) objects.emplace_back(rt::String::fromUTF8("t"));
    return SRLScopeTagSetCodableWrapper::initWithTags(rt::make<rt::Array>(std::move(objects)));
  }
  Tags fitting(const Tags& tags, Expected& expected) const {
    if (!isTooLong_) return tags;
    expected.reports.emplace_back("SRLScopeTagSet only supports up to %@ tags");
    return {};
  }

  static std::vector<rt::Object*> sorted(std::vector<rt::Object*> instances) {
    std::ranges::sort(instances);
    return instances;
  }
  static std::vector<rt::Object*> sorted(const Ref<rt::Array>& array) {
    std::vector<rt::Object*> instances;
    // A scope also stores the null that a factory returned.
    for (const Ref<rt::Object>& each : *array) {
      if (each) instances.push_back(each.get());
    }
    return sorted(std::move(instances));
  }

  // Requires the reports and factory calls that the model expects, in any order. Stores the new instances in
  // the model. Returns the instances that the operation must have used.
  std::vector<rt::Object*> checkDone(const Expected& expected) {
    Reports texts;
    for (const Ref<LUMLogMessage>& message : reports_.messages()) {
      require(message->level() == LUMLogLevelFault);
      texts.emplace_back(message->format().view().substr(0, kPrefix));
    }
    Reports wanted;
    for (const std::string& text : expected.reports) wanted.push_back(text.substr(0, kPrefix));
    std::ranges::sort(texts);
    std::ranges::sort(wanted);
    require(texts == wanted);
    require(std::ranges::is_permutation(made, expected.made));
    std::vector<rt::Object*> instances = expected.kept;
    for (const Made& each : made) {
      model_.keep(each);
      if (each.instance != nullptr) instances.push_back(each.instance);
    }
    model_.forgetPending();
    made.clear();
    return instances;
  }
  void check(const Expected& expected, Ref<rt::Object> result) {
    const std::vector<rt::Object*> instances = checkDone(expected);
    require(expected.isNull == !result);
    require(expected.isNull ? instances.empty() : instances == std::vector{result.get()});
    result = nullptr;
    require(instancesAlive == model_.countAlive());
  }
  void check(const Expected& expected, Ref<rt::Array> result) {
    const std::vector<rt::Object*> instances = checkDone(expected);
    require(expected.isNull == !result);
    if (result) require(sorted(result) == sorted(instances));
    result = nullptr;
    require(instancesAlive == model_.countAlive());
  }
  void check(const Expected& expected, bool result) {
    require(checkDone(expected).empty() && result == expected.answer);
  }
  void check(const Expected& expected) {
    require(checkDone(expected).empty() && instancesAlive == model_.countAlive());
  }

  // The length of a prefix that distinguishes the reports.
  static constexpr std::size_t kPrefix = 40;

  static TestReports& reports() {
    static TestReports reports;
    return reports;
  }

  FuzzedDataProvider& data_;
  TestReports& reports_ = reports();
  const Records records_;
  Model model_;
  std::vector<Ref<SRLRegistry>> registries_;
  Ref<SRLRegistry> before_;
  bool isTooLong_ = false;
};

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  LUMLogMultiplexer::sharedInstance()->setCaptureCallStack(false);
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t size) {
  made.clear();
  FuzzedDataProvider data(bytes, size);
  Session(data).run();
  return 0;
}
