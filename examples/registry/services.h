#pragma once

// The program's services, as the program's author writes them.

#include <utility>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"

// Holds the messages of an account.
struct MessageStore : rt::Protocol<MessageStore> {
  virtual rt::String name() const = 0;

 protected:
  ~MessageStore() = default;
};

// Shows the messages of an account in a window. There is one for each window of each account.
struct MessageList : rt::Protocol<MessageList> {
  virtual rt::String title() const = 0;

 protected:
  ~MessageList() = default;
};

// A task to run when a window opens.
struct WindowTask : rt::Protocol<WindowTask> {
  virtual rt::String label() const = 0;

 protected:
  ~WindowTask() = default;
};
