// A mail program whose services are wired in app.h.

#include <cstdio>
#include <string>

#include "app.h"

using namespace rt::literals;

namespace {

void print(const rt::String& line) {
  std::printf("%s\n", std::string(line).c_str());
}

}  // namespace

int main() {
  const User ann{"Ann"_s};

  // The tags may be given in any order.
  print(App::get<Session>(ann, Window{1})->title());
  print(App::get<Session>(Window{2}, ann)->title());
  print(App::get<Preferences>(ann) == App::get<Preferences>(User{"Ann"_s}) ? "the same preferences"_s
                                                                           : "other preferences"_s);

  for (const Importer& importer : App::all<Importer>()) {
    if (importer.format() == "CSV"_s) print("reads CSV"_s);
  }
  print(App::get<Search>(ann)->find("a word"_s));
  print(App::get<Draft>() == App::get<Draft>() ? "one draft"_s : "two drafts"_s);
  print(App::get<Factory<Draft(rt::String)>>(ann)->make("lunch"_s)->text());

  // Ann logs out. All her services end.
  const rt::Ref<Preferences> old = App::get<Preferences>(ann);
  srl::removeScopes(ann);
  print(App::get<Preferences>(ann) == old ? "the same preferences"_s : "other preferences"_s);
  return 0;
}
