#pragma once

// The program's services, as the program's author writes them. They know nothing of the registry.

#include "Runtime/Runtime.h"

// Tells the time.
struct Clock : rt::Protocol<Clock> {
  virtual rt::String now() const = 0;

 protected:
  ~Clock() = default;
};

// What a user prefers.
struct Preferences : rt::Protocol<Preferences> {
  virtual rt::String greeting() const = 0;

 protected:
  ~Preferences() = default;
};

// What a user does in a window.
struct Session : rt::Protocol<Session> {
  virtual rt::String title() const = 0;

 protected:
  ~Session() = default;
};

// Reads messages of one format.
struct Importer : rt::Protocol<Importer> {
  virtual rt::String format() const = 0;

 protected:
  ~Importer() = default;
};

// Counts what users do. Nothing is bound to it in this program.
struct Telemetry : rt::Protocol<Telemetry> {
 protected:
  ~Telemetry() = default;
};

// Holds the messages of a user.
struct Store : rt::Protocol<Store> {
  virtual rt::String summary() const = 0;

 protected:
  ~Store() = default;
};

// Finds messages of a user.
struct Search : rt::Protocol<Search> {
  virtual rt::String find(const rt::String& word) const = 0;

 protected:
  ~Search() = default;
};

// A message that is being written.
struct Draft : rt::Protocol<Draft> {
  virtual rt::String text() const = 0;

 protected:
  ~Draft() = default;
};
