#pragma once

// The injectors, one for each service, as a generator writes them: what the program calls.

#include "Runtime/Runtime.h"
#include "services.h"

// The service for an account.
rt::Ref<MessageStore> injectMessageStore(const rt::Ref<rt::Object>& account);

// The service for a window of an account.
rt::Ref<MessageList> injectMessageList(const rt::Ref<rt::Object>& account, const rt::Ref<rt::Object>& window);

// All that there are, new each time.
rt::Ref<rt::Array> injectWindowTasks(const rt::Ref<rt::Object>& account);
