#pragma once

// The wiring of the program. Its implementations are in app.cpp.

#include "Shared/ServiceRegistry/Module.h"
#include "services.h"

class SystemClock;
class FilePreferences;
class WindowSession;
class CsvImporter;
class JsonImporter;
class DiskStore;
class IndexSearch;
class EmptyDraft;
class Letter;

using srl::All, srl::Bind, srl::Factory, srl::Given, srl::Lazy, srl::Many, srl::Maybe, srl::New;

// clang-format off
struct User : srl::Tag<User, rt::String> {};
struct Window : srl::Tag<Window, int> {};

struct App : srl::Module<App,
    Bind<Clock, SystemClock>,
    Bind<Preferences(User), FilePreferences(User)>,
    Bind<Session(User, Window), WindowSession(Preferences, Clock, Window)>,
    Many<Importer, CsvImporter, JsonImporter(Clock)>,
    Bind<Store(User), DiskStore(User, Search, All<Importer>, Maybe<Telemetry>)>,
    Bind<Search(User), IndexSearch(Lazy<Store>)>,
    New<Draft, EmptyDraft(Clock)>,
    Bind<Factory<Draft(rt::String)>(User), Letter(Preferences, Given<rt::String>)>> {};
// clang-format on
