// The implementations. Each takes what it needs in its constructor, and knows nothing of the registry.

#include "app.h"

#include <utility>

using namespace rt::literals;

class SystemClock final : public rt::Implements<SystemClock, rt::Object, Clock> {
 public:
  rt::String now() const override { return "noon"_s; }
};

class FilePreferences final : public rt::Implements<FilePreferences, rt::Object, Preferences> {
 public:
  explicit FilePreferences(rt::String user) : user_(std::move(user)) {}
  rt::String greeting() const override { return "Hello, "_s + user_; }

 private:
  const rt::String user_;
};

class WindowSession final : public rt::Implements<WindowSession, rt::Object, Session> {
 public:
  WindowSession(rt::Ref<Preferences> preferences, rt::Ref<Clock> clock, int window)
      : preferences_(std::move(preferences)), clock_(std::move(clock)), window_(window) {}
  rt::String title() const override {
    return rt::format("%@! It is %@ in window %d"_s, preferences_->greeting(), clock_->now(), window_);
  }

 private:
  const rt::Ref<Preferences> preferences_;
  const rt::Ref<Clock> clock_;
  const int window_;
};

class CsvImporter final : public rt::Implements<CsvImporter, rt::Object, Importer> {
 public:
  rt::String format() const override { return "CSV"_s; }
};

class JsonImporter final : public rt::Implements<JsonImporter, rt::Object, Importer> {
 public:
  explicit JsonImporter(rt::Ref<Clock> clock) : clock_(std::move(clock)) {}
  rt::String format() const override { return "JSON at "_s + clock_->now(); }

 private:
  const rt::Ref<Clock> clock_;
};

class DiskStore final : public rt::Implements<DiskStore, rt::Object, Store> {
 public:
  DiskStore(rt::String user, rt::Ref<Search> search, const srl::All<Importer>& importers,
            rt::Ref<Telemetry> telemetry)
      : user_(std::move(user)),
        search_(std::move(search)),
        formats_(static_cast<int>(importers.size())),
        telemetry_(std::move(telemetry)) {}
  rt::String summary() const override {
    return rt::format("the store of %@ reads %d formats, %@"_s, user_, formats_,
                      telemetry_ ? "and counts"_s : "and counts nothing"_s);
  }

 private:
  const rt::String user_;
  const rt::Ref<Search> search_;
  const int formats_;
  const rt::Ref<Telemetry> telemetry_;
};

// It needs the store, which needs it. So it asks for the store when it is used.
class IndexSearch final : public rt::Implements<IndexSearch, rt::Object, Search> {
 public:
  explicit IndexSearch(srl::Lazy<Store> store) : store_(std::move(store)) {}
  rt::String find(const rt::String& word) const override {
    return rt::format("%@ is not where %@"_s, word, store_.get()->summary());
  }

 private:
  const srl::Lazy<Store> store_;
};

class EmptyDraft final : public rt::Implements<EmptyDraft, rt::Object, Draft> {
 public:
  explicit EmptyDraft(const rt::Ref<Clock>& clock) : begun_(clock->now()) {}
  rt::String text() const override { return "begun at "_s + begun_; }

 private:
  const rt::String begun_;
};

class Letter final : public rt::Implements<Letter, rt::Object, Draft> {
 public:
  Letter(const rt::Ref<Preferences>& preferences, const rt::String& about)
      : text_(rt::format("%@, about %@"_s, preferences->greeting(), about)) {}
  rt::String text() const override { return text_; }

 private:
  const rt::String text_;
};

template struct srl::Linked<App>;
