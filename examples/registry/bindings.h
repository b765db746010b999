#pragma once

// The injectors, in the form that a generator writes, one for each service. The program calls them.

#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Values/Array.h"
#include "services.h"

// Returns the store of an account.
rt::Ref<MessageStore> injectMessageStore(const rt::Ref<rt::Object>& account);

// Returns the list for a window of an account.
rt::Ref<MessageList> injectMessageList(const rt::Ref<rt::Object>& account, const rt::Ref<rt::Object>& window);

// Returns all tasks. Each call makes new ones.
rt::Ref<rt::Array> injectWindowTasks(const rt::Ref<rt::Object>& account);
