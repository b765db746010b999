#include "Runtime/Queues/Private/TaskContext.h"

#include <gtest/gtest.h>

#include <latch>
#include <thread>

#include "Runtime/Objects/Weak.h"
#include "Runtime/Queues/Queue.h"

namespace {

using namespace rt::literals;
using rt::Queue;
using rt::Ref;
using rt::TaskContext;

class Context : public rt::Implements<Context, rt::Object> {
 public:
  static constexpr std::string_view kClassName = "TestContext";
};

class TaskContextTest : public testing::Test {
 protected:
  // The context of a task that is queued now.
  rt::Object* contextOfTask() {
    rt::Object* context = nullptr;
    queue_->async([&] { context = TaskContext::current(); });
    queue_->barrierSync();
    return context;
  }

  const Ref<Context> context_ = rt::make<Context>();
  const Ref<Context> inner_ = rt::make<Context>();
  const Ref<Queue> queue_ = rt::make<Queue>("TaskContext_test"_s);
};

TEST_F(TaskContextTest, IsNullAtFirst) {
  EXPECT_EQ(TaskContext::current(), nullptr);
  EXPECT_EQ(contextOfTask(), nullptr);
}

TEST_F(TaskContextTest, IsThatOfTheInnermostScope) {
  {
    const TaskContext::Scope scope(context_.get());
    EXPECT_EQ(TaskContext::current(), context_.get());
    {
      const TaskContext::Scope inner(inner_.get());
      EXPECT_EQ(TaskContext::current(), inner_.get());
      const TaskContext::Scope none(nullptr);
      EXPECT_EQ(TaskContext::current(), nullptr);
    }
    EXPECT_EQ(TaskContext::current(), context_.get());
  }
  EXPECT_EQ(TaskContext::current(), nullptr);
}

TEST_F(TaskContextTest, BelongsToOneThread) {
  const TaskContext::Scope scope(context_.get());
  rt::Object* other = context_.get();
  std::thread([&] { other = TaskContext::current(); }).join();
  EXPECT_EQ(other, nullptr);
}

TEST_F(TaskContextTest, GoesAlongToATask) {
  const TaskContext::Scope scope(context_.get());
  EXPECT_EQ(contextOfTask(), context_.get());
}

TEST_F(TaskContextTest, IsThatOfTheMomentWhenTheTaskIsQueued) {
  std::latch mayRun(1);
  rt::Object* queuedWithin = nullptr;
  rt::Object* queuedAfter = context_.get();
  {
    const TaskContext::Scope scope(context_.get());
    queue_->async([&] {
      mayRun.wait();
      queuedWithin = TaskContext::current();
    });
  }
  queue_->async([&] { queuedAfter = TaskContext::current(); });
  mayRun.count_down();
  queue_->barrierSync();
  EXPECT_EQ(queuedWithin, context_.get());
  EXPECT_EQ(queuedAfter, nullptr);
}

TEST_F(TaskContextTest, IsRetainedByATask) {
  Ref<Context> context = rt::make<Context>();
  const rt::Weak<Context> weak = context;
  std::latch mayRun(1);
  bool isAlive = false;
  {
    const TaskContext::Scope scope(context.get());
    queue_->async([&] {
      mayRun.wait();
      isAlive = TaskContext::current() == weak.lock().get();
    });
  }
  context = nullptr;
  mayRun.count_down();
  queue_->barrierSync();
  EXPECT_TRUE(isAlive);
  EXPECT_FALSE(weak.lock());
}

// A thread that waits in `sync` may run other tasks of the queue. Its own context must not reach them.
TEST_F(TaskContextTest, DoesNotReachTasksThatItsThreadRunsForOthers) {
  const TaskContext::Scope scope(context_.get());
  rt::Object* ofAsync = context_.get();
  {
    const TaskContext::Scope none(nullptr);
    queue_->async([&] { ofAsync = TaskContext::current(); });
  }
  EXPECT_EQ(queue_->sync([] { return TaskContext::current(); }), context_.get());
  EXPECT_EQ(ofAsync, nullptr);
}

// The queue is busy on another thread, which also runs the task that this thread waits for.
TEST_F(TaskContextTest, GoesAlongToATaskOfSyncOnAnotherThread) {
  std::latch isRunning(1);
  std::latch mayReturn(1);
  queue_->async([&] {
    isRunning.count_down();
    mayReturn.wait();
  });
  isRunning.wait();
  std::thread releaser([&] { mayReturn.count_down(); });
  const TaskContext::Scope scope(context_.get());
  EXPECT_EQ(queue_->sync([] { return TaskContext::current(); }), context_.get());
  releaser.join();
}

TEST_F(TaskContextTest, GoesAlongFromTaskToTask) {
  const Ref<Queue> other = rt::make<Queue>("other"_s);
  rt::Object* context = nullptr;
  {
    const TaskContext::Scope scope(context_.get());
    queue_->async([&] { other->async([&] { context = TaskContext::current(); }); });
  }
  queue_->barrierSync();
  other->barrierSync();
  EXPECT_EQ(context, context_.get());
}

TEST_F(TaskContextTest, EndsWithATaskThatThrows) {
  const auto handler = Queue::setUncaughtExceptionHandler([](const Queue&) {});
  rt::Object* next = context_.get();
  {
    const TaskContext::Scope scope(context_.get());
    queue_->async([] { throw 1; });
  }
  queue_->async([&] { next = TaskContext::current(); });
  queue_->barrierSync();
  Queue::setUncaughtExceptionHandler(handler);
  EXPECT_EQ(next, nullptr);
}

}  // namespace
