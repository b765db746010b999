// A module from its wiring to its instances: what constructors get, how long instances live, and how a typed
// module stands beside others.

#include "Shared/ServiceRegistry/Source/Front/Module.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLBindingsModuleData.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLRegistrationData.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSet.h"
#include "Shared/ServiceRegistry/Source/Front/All.h"
#include "Shared/ServiceRegistry/Source/Front/Dependency.h"
#include "Shared/ServiceRegistry/Source/Front/Lazy.h"
#include "Shared/ServiceRegistry/Source/Front/Service.h"
#include "Shared/ServiceRegistry/Source/Front/Tag.h"
#include "Shared/ServiceRegistry/Source/Front/Wiring.h"
#include "Shared/ServiceRegistry/Source/SRLRegistry.h"
#include "tests/support/TestReports.h"

using namespace rt::literals;

namespace {

using rt::Ref;
using srl::All;
using srl::Bind;
using srl::Expects;
using srl::Factory;
using srl::Given;
using srl::Lazy;
using srl::Many;
using srl::Maybe;
using srl::New;
using testing::ElementsAre;
using testing::UnorderedElementsAre;

// Two dimensions with values of one type.
struct User : srl::Tag<User, int> {};
struct Window : srl::Tag<Window, int> {};
struct Language : srl::Tag<Language, std::string> {};

struct Clock : rt::Protocol<Clock> {
 protected:
  ~Clock() = default;
};
struct Preferences : rt::Protocol<Preferences> {
  virtual int user() const = 0;

 protected:
  ~Preferences() = default;
};
struct Session : rt::Protocol<Session> {
  virtual Ref<Preferences> preferences() const = 0;
  virtual Ref<Clock> clock() const = 0;
  virtual std::string place() const = 0;

 protected:
  ~Session() = default;
};
struct Importer : rt::Protocol<Importer> {
  virtual std::string format() const = 0;

 protected:
  ~Importer() = default;
};
struct Telemetry : rt::Protocol<Telemetry> {
 protected:
  ~Telemetry() = default;
};
struct Draft : rt::Protocol<Draft> {
  virtual std::string text() const = 0;

 protected:
  ~Draft() = default;
};
struct Hen : rt::Protocol<Hen> {
  virtual Ref<rt::Object> egg() const = 0;

 protected:
  ~Hen() = default;
};
struct Egg : rt::Protocol<Egg> {
  virtual Ref<Hen> hen() const = 0;

 protected:
  ~Egg() = default;
};

class SystemClock final : public rt::Implements<SystemClock, rt::Object, Clock> {};

class FilePreferences final : public rt::Implements<FilePreferences, rt::Object, Preferences> {
 public:
  explicit FilePreferences(int user) : user_(user) {}
  int user() const override { return user_; }

 private:
  const int user_;
};

class WindowSession final : public rt::Implements<WindowSession, rt::Object, Session> {
 public:
  WindowSession(std::string language, Ref<Preferences> preferences, Window window, Ref<Clock> clock)
      : language_(std::move(language)),
        preferences_(std::move(preferences)),
        window_(window),
        clock_(std::move(clock)) {}
  Ref<Preferences> preferences() const override { return preferences_; }
  Ref<Clock> clock() const override { return clock_; }
  std::string place() const override { return language_ + " " + std::to_string(window_.value()); }

 private:
  const std::string language_;
  const Ref<Preferences> preferences_;
  const Window window_;
  const Ref<Clock> clock_;
};

class CsvImporter final : public rt::Implements<CsvImporter, rt::Object, Importer> {
 public:
  std::string format() const override { return "csv"; }
};
class JsonImporter final : public rt::Implements<JsonImporter, rt::Object, Importer> {
 public:
  explicit JsonImporter(const Ref<Clock>& clock) : hasClock_(clock != nullptr) {}
  std::string format() const override { return hasClock_ ? "json" : "no clock"; }

 private:
  const bool hasClock_;
};
class XmlImporter final : public rt::Implements<XmlImporter, rt::Object, Importer> {
 public:
  std::string format() const override { return "xml"; }
};

// Its text says what the constructor got.
class TextDraft final : public rt::Implements<TextDraft, rt::Object, Draft> {
 public:
  explicit TextDraft(std::string text) : text_(std::move(text)) {}
  TextDraft(const All<Importer>& importers, const Ref<Telemetry>& telemetry)
      : text_(std::to_string(importers.size()) + (telemetry ? " telemetry" : " none")) {}
  TextDraft(std::string& title, User user, const Ref<Preferences>& preferences, int pages)
      : text_(title + " " + std::to_string(user.value()) + std::to_string(preferences->user()) + " " +
              std::to_string(pages)) {
    title = "seen";
  }
  std::string text() const override { return text_; }

 private:
  const std::string text_;
};

class LazyHen final : public rt::Implements<LazyHen, rt::Object, Hen> {
 public:
  explicit LazyHen(Lazy<Egg> egg) : egg_(std::move(egg)) {}
  Ref<rt::Object> egg() const override { return egg_.get(); }

 private:
  const Lazy<Egg> egg_;
};
class HenEgg final : public rt::Implements<HenEgg, rt::Object, Egg> {
 public:
  explicit HenEgg(Ref<Hen> hen) : hen_(std::move(hen)) {}
  Ref<Hen> hen() const override { return hen_; }

 private:
  const Ref<Hen> hen_;
};

struct App
    : srl::Module<App,
                  Bind<Session(Window, User, Language), WindowSession(Language, Preferences, Window, Clock)>,
                  Bind<Preferences(User), FilePreferences(User)>, Bind<Clock, SystemClock>,
                  Many<Importer, CsvImporter, JsonImporter(Clock)>,
                  New<Draft, TextDraft(All<Importer>, Maybe<Telemetry>)>,
                  Bind<Factory<Draft(std::string&, int)>(User),
                       TextDraft(Given<std::string&>, User, Preferences, Given<int>)>,
                  Bind<Hen(User), LazyHen(Lazy<Egg>)>, Bind<Egg(User), HenEgg(Hen)>> {};

// A module of another library.
struct Plugin : srl::Module<Plugin, Expects<Preferences(User)>, Many<Importer, XmlImporter>> {};

using MakeDraft = Factory<Draft(std::string&, int)>;

}  // namespace

template struct srl::Linked<App>;
template struct srl::Linked<Plugin>;

namespace {

std::vector<std::string> formats(const All<Importer>& importers) {
  std::vector<std::string> all;
  for (const Importer& importer : importers) all.push_back(importer.format());
  return all;
}

TEST(Module, HasOneInstanceForEachScope) {
  const User ann{1};
  const Ref<Preferences> preferences = App::get<Preferences>(ann);
  EXPECT_EQ(preferences->user(), 1);
  EXPECT_EQ(App::get<Preferences>(User{1}), preferences);
  EXPECT_NE(App::get<Preferences>(User{2}), preferences);
  EXPECT_EQ(App::get<Clock>(), App::get<Clock>());
}

TEST(Module, PassesConstructorsWhatTheWiringLists) {
  const Ref<Session> session = App::get<Session>(User{1}, Window{2}, Language{"en"});
  EXPECT_EQ(session->place(), "en 2");
  EXPECT_EQ(session->preferences(), App::get<Preferences>(User{1}));
  EXPECT_EQ(session->clock(), App::get<Clock>());
}

TEST(Module, TakesTagsInAnyOrder) {
  const Ref<Session> session = App::get<Session>(User{1}, Window{2}, Language{"en"});
  EXPECT_EQ(App::get<Session>(Language{"en"}, User{1}, Window{2}), session);
  EXPECT_EQ((srl::get<Session(Language, User, Window)>(Window{2}, Language{"en"}, User{1})), session);
  EXPECT_NE(App::get<Session>(Language{"en"}, User{2}, Window{1}), session);
}

TEST(Module, EndsTheScopesOfATagOnly) {
  const Ref<Session> session = App::get<Session>(User{7}, Window{8}, Language{"en"});
  srl::removeScopes(Window{7});
  EXPECT_EQ(App::get<Session>(User{7}, Window{8}, Language{"en"}), session);
  srl::removeScopes(User{7});
  EXPECT_NE(App::get<Session>(User{7}, Window{8}, Language{"en"}), session);
}

TEST(Module, MakesANewInstanceEachTime) {
  EXPECT_NE(App::get<Draft>(), App::get<Draft>());
}

TEST(Module, GivesAllAndNullForWhatIsNotBound) {
  EXPECT_EQ(App::get<Draft>()->text(), "3 none");
  EXPECT_EQ((srl::maybe<Telemetry>()), nullptr);
  EXPECT_EQ(App::maybe<Clock>(), App::get<Clock>());
}

TEST(Module, JoinsImplementationsOfSeveralModules) {
  EXPECT_THAT(formats(App::all<Importer>()), UnorderedElementsAre("csv", "json", "xml"));
  EXPECT_THAT(formats(Plugin::all<Importer>()), UnorderedElementsAre("csv", "json", "xml"));
}

TEST(Module, GetsWhatAnotherModuleBinds) {
  EXPECT_EQ(Plugin::get<Preferences>(User{1}), App::get<Preferences>(User{1}));
}

TEST(Module, MakesObjectsFromArgumentsOfTheCaller) {
  const Ref<MakeDraft> drafts = App::get<MakeDraft>(User{4});
  EXPECT_EQ(App::get<MakeDraft>(User{4}), drafts);
  std::string title = "Letter";
  const Ref<Draft> draft = drafts->make(title, 9);
  EXPECT_EQ(draft->text(), "Letter 44 9");
  EXPECT_EQ(title, "seen");
  EXPECT_NE(drafts->make(title, 9), draft);
}

TEST(Module, LetsServicesNeedEachOtherLazily) {
  const Ref<Egg> egg = App::get<Egg>(User{5});
  EXPECT_EQ(egg->hen()->egg(), Ref<rt::Object>(egg));
}

TEST(Module, KeepsTheTagsOfALazyService) {
  Lazy<Preferences> first = App::lazy<Preferences>(User{1});
  {
    const Lazy<Preferences> second = App::lazy<Preferences>(User{2});
    first = second;
  }
  EXPECT_EQ(first.get()->user(), 2);
}

TEST(Module, IsARecordLikeAGeneratedOne) {
  const SRLBindingsModuleData& module = *srl::Linked<App>::module();
  EXPECT_TRUE(SRLAreBindingsSorted(module.bindings()));
  EXPECT_EQ(module.allowsMultipleModules, 1);
  std::vector<std::string> identifiers;
  for (const _SRLBindingRegistrationData& binding : module.bindings())
    identifiers.emplace_back(binding.api->identifier);
  EXPECT_THAT(identifiers,
              ElementsAre("Egg", "Hen", "Clock", "Draft", "Session", "Importer", "Preferences", testing::_));

  const _SRLBindingRegistrationData& session = module.bindings()[4];
  EXPECT_EQ(session.api->scopeType, 0b111U);
  EXPECT_EQ(session.api->isMultibound, 0);
  EXPECT_STREQ(session.api->instanceType.names.protocolName, "Session");
  EXPECT_EQ(session.api->instanceType.names.className, nullptr);
  EXPECT_STREQ(session.implementations[0]->identifier, "WindowSession");
  EXPECT_STREQ(session.implementations[0]->instanceType.className, "WindowSession");
  EXPECT_EQ(session.implementations[0]->scopeType, 0b111U);
  EXPECT_EQ(session.implementations[0]->lifetime, 0U);
  EXPECT_EQ(session.implementations[1], nullptr);

  EXPECT_EQ(module.bindings()[3].implementations[0]->lifetime, 1U);
  const _SRLBindingRegistrationData& importer = module.bindings()[5];
  EXPECT_EQ(importer.api->isMultibound, 1);
  EXPECT_STREQ(importer.implementations[1]->identifier, "JsonImporter");
  EXPECT_EQ(importer.implementations[2], nullptr);
}

TEST(Module, IsFoundByIdentifier) {
  const User ann{1};
  const Ref<rt::Array> tags = rt::Array::of(Ref<rt::Object>(ann.object()));
  const Ref<rt::Object> found = SRLRegistry::sharedInstance()->eg_internalService(
      "Preferences"_s, SRLScopeTagSetCodableWrapper::initWithTags(tags));
  EXPECT_EQ(found, Ref<rt::Object>(App::get<Preferences>(ann)));
}

// A caller by identifier may pass any object as a tag.
TEST(Module, MakesNothingFromATagOfAnotherKind) {
  TestReports reports;
  const Window window{3};
  const SRLScopeTagSet tags{{window.object()}};
  const SRLAPIRegistrationData* preferences = srl::Linked<App>::module()->bindings()[6].api;
  EXPECT_EQ(SRLRegistry::sharedInstance()->internalService(preferences, tags), nullptr);
  EXPECT_THAT(reports.texts(),
              ElementsAre(testing::HasSubstr("bound to required service Preferences, returned nil.")));
}

TEST(Tag, ComparesValuesOfOneDimension) {
  EXPECT_EQ(User{1}, User{1});
  EXPECT_FALSE(User{1} == User{2});
  EXPECT_TRUE(User{1}.object()->isEqual(User{1}.object()));
  EXPECT_EQ(User{1}.object()->hash(), User{1}.object()->hash());
  EXPECT_FALSE(User{1}.object()->isEqual(Window{1}.object()));
  EXPECT_FALSE(User{1}.object()->isEqual(nullptr));
  EXPECT_EQ(User{1}.object()->classInfo().name, "Tag<User>");
}

TEST(Tag, ConvertsToItsValue) {
  const Language language{"en"};
  const std::string& value = language;
  EXPECT_EQ(value, "en");
  Language copy = language;
  const Language moved = std::move(copy);
  EXPECT_EQ(moved.value(), "en");
  EXPECT_EQ(copy.value(), "en");  // NOLINT(bugprone-use-after-move): a tag always has a value
}

TEST(All, IsEmptyWithoutAnArray) {
  const All<Importer> none(nullptr);
  EXPECT_TRUE(none.empty());
  EXPECT_EQ(none.size(), 0U);
  EXPECT_TRUE(none.begin() == none.end());
}

}  // namespace
