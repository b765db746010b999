#pragma once

// The program's services, as its author writes them.

#include <utility>

#include "Runtime/Runtime.h"

// Where an account's messages are.
struct MessageStore : rt::Protocol<MessageStore> {
  virtual rt::String name() const = 0;

 protected:
  ~MessageStore() = default;
};

// What a window shows of them: one for each window of each account.
struct MessageList : rt::Protocol<MessageList> {
  virtual rt::String title() const = 0;

 protected:
  ~MessageList() = default;
};

// What may be done when a window opens.
struct WindowTask : rt::Protocol<WindowTask> {
  virtual rt::String label() const = 0;

 protected:
  ~WindowTask() = default;
};
