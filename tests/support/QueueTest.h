#pragma once

// A fixture for the tests of queues. It has a serial queue.

#include <gtest/gtest.h>

#include "Runtime/Queues/Queue.h"

class QueueTest : public testing::Test {
 protected:
  QueueTest() { GTEST_FLAG_SET(death_test_style, "threadsafe"); }

  const rt::Ref<rt::Queue> queue_ = rt::make<rt::Queue>(rt::String::fromUTF8("test"));
};

using QueueDeathTest = QueueTest;
