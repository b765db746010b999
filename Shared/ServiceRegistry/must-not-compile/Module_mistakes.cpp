// Mistakes in the wiring of a module, and in look-ups. Each macro selects one mistake.
#include "Shared/ServiceRegistry/Module.h"

struct User : srl::Tag<User, rt::String> {};
struct Window : srl::Tag<Window, int> {};

struct Clock : rt::Protocol<Clock> {
 protected:
  ~Clock() = default;
};
struct Preferences : rt::Protocol<Preferences> {
 protected:
  ~Preferences() = default;
};
struct Store : rt::Protocol<Store> {
 protected:
  ~Store() = default;
};
struct Draft : rt::Protocol<Draft> {
 protected:
  ~Draft() = default;
};

struct Exporter : rt::Protocol<Exporter> {
 protected:
  ~Exporter() = default;
};

struct SystemClock final : rt::Implements<SystemClock, rt::Object, Clock> {};
struct OtherClock final : rt::Implements<OtherClock, rt::Object, Clock> {};
struct CachedClock final : rt::Implements<CachedClock, rt::Object, Clock> {
  explicit CachedClock(const rt::Ref<Preferences>&) {}
};
struct FilePreferences final : rt::Implements<FilePreferences, rt::Object, Preferences> {
  FilePreferences(const User&, const rt::Ref<Store>&) {}
};
struct DiskStore final : rt::Implements<DiskStore, rt::Object, Store> {
  DiskStore(const rt::Ref<Clock>&, const srl::Lazy<Preferences>&) {}
  DiskStore(const rt::Ref<Preferences>&, int) {}
};
struct TextDraft final : rt::Implements<TextDraft, rt::Object, Draft> {
  TextDraft(const rt::Ref<Clock>&, int) {}
};

using srl::All;
using srl::Bind;
using srl::Expects;
using srl::Factory;
using srl::Given;
using srl::Lazy;
using srl::Many;
using srl::Maybe;
using srl::New;

struct Right
    : srl::Module<Right, Bind<Clock, SystemClock>, Bind<Preferences(User), FilePreferences(User, Store)>,
                  Bind<Store(User), DiskStore(Clock, Lazy<Preferences>)>, Many<Exporter>,
                  Bind<Factory<Draft(int)>, TextDraft(Clock, Given<int>)>> {};
template struct srl::Linked<Right>;

[[maybe_unused]] static void lookUp(const User& ann, const Window& left) {
  Right::get<Clock>();
  Right::get<Store>(ann);
  srl::get<Draft(Window, User)>(ann, left);
#ifdef MISSING_TAG
  Right::get<Store>();
#endif
#ifdef EXTRA_TAG
  Right::get<Store>(ann, left);
#endif
#ifdef WRONG_TAG
  Right::get<Store>(left);
#endif
#ifdef TAG_TWICE
  Right::get<Store>(ann, ann);
#endif
#ifdef NO_TAG_AT_ALL
  Right::get<Store>(7);
#endif
#ifdef NOT_IN_MODULE
  Right::get<Draft>();
#endif
#ifdef ONE_ASKED_OF_MANY
  Right::get<Exporter>();
#endif
#ifdef ALL_ASKED_OF_ONE
  Right::all<Clock>();
#endif
}

#ifdef NOTHING_BOUND
struct App : srl::Module<App, Bind<Store, DiskStore(Clock)>> {};
#endif
#ifdef NOTHING_BOUND_FOR_ONE_OF_MANY
struct App : srl::Module<App, Many<Store, DiskStore(Lazy<Preferences>)>> {};
#endif
#ifdef CYCLE
struct App : srl::Module<App, Bind<Clock, CachedClock(Preferences)>,
                         Bind<Preferences, FilePreferences(Store)>, Bind<Store, DiskStore(Preferences)>> {};
#endif
#ifdef CYCLE_OF_ONE
struct App : srl::Module<App, Bind<Clock, CachedClock(Maybe<Clock>)>> {};
#endif
#ifdef NARROWER_SCOPE
struct App : srl::Module<App, Expects<Preferences(User)>, Bind<Clock, CachedClock(Preferences)>> {};
#endif
#ifdef LAZY_NARROWER_SCOPE
struct App
    : srl::Module<App, Expects<Preferences(User)>, Bind<Clock(Window), CachedClock(Lazy<Preferences>)>> {};
#endif
#ifdef NO_SUCH_DIMENSION
struct App : srl::Module<App, Bind<Clock(Window), CachedClock(User)>> {};
#endif
#ifdef DIMENSION_TWICE
struct App : srl::Module<App, Bind<Clock(User, User), SystemClock>> {};
#endif
#ifdef TWO_FOR_ONE
struct App
    : srl::Module<App, Bind<Clock, SystemClock>, Bind<Store, DiskStore(Clock)>, Bind<Clock, OtherClock>> {};
#endif
#ifdef BOUND_AND_EXPECTED
struct App : srl::Module<App, Bind<Clock, SystemClock>, Expects<Clock(User)>> {};
#endif
#ifdef ONE_NAME
namespace other {
struct Clock : rt::Protocol<Clock> {};
}  // namespace other
struct App : srl::Module<App, Expects<Clock, other::Clock>> {};
#endif
#ifdef NEEDS_ONE_OF_MANY
struct App : srl::Module<App, Many<Clock, SystemClock, OtherClock>, Bind<Store, DiskStore(Clock)>> {};
#endif
#ifdef NEEDS_ALL_OF_ONE
struct App : srl::Module<App, Bind<Clock, SystemClock>, Bind<Store, DiskStore(All<Clock>)>> {};
#endif
#ifdef NO_SERVICE
struct App : srl::Module<App, Bind<Clock, CachedClock(int)>> {};
#endif
#ifdef NO_DECLARATION
struct App : srl::Module<App, Clock> {};
#endif

#ifdef NOT_IMPLEMENTED
struct App : srl::Module<App, Bind<Clock, FilePreferences>> {};
template struct srl::Linked<App>;
#endif
#ifdef NO_CONSTRUCTOR
struct App : srl::Module<App, Bind<Clock, SystemClock>, Bind<Store, DiskStore(Clock)>> {};
template struct srl::Linked<App>;
#endif
#ifdef GIVEN_WITHOUT_FACTORY
struct App : srl::Module<App, Bind<Clock, SystemClock>, Bind<Draft, TextDraft(Clock, Given<int>)>> {};
template struct srl::Linked<App>;
#endif
#ifdef OTHER_ARGUMENTS
struct App
    : srl::Module<App, Bind<Clock, SystemClock>, Bind<Factory<Draft(long)>, TextDraft(Clock, Given<int>)>> {};
template struct srl::Linked<App>;
#endif
#ifdef FACTORY_OF_ANOTHER
struct App
    : srl::Module<App, Bind<Clock, SystemClock>, Bind<Factory<Store(int)>, TextDraft(Clock, Given<int>)>> {};
template struct srl::Linked<App>;
#endif
#ifdef NO_EQUALITY
struct Point {
  int x;
};
struct Place : srl::Tag<Place, Point> {};
static const Place origin{Point{0}};
#endif
