#include "Runtime/Process/Process.h"

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdlib>

namespace {

TEST(Process, HasTheNameOfItsProgram) {
  EXPECT_EQ(rt::Process::name(), "Process_test");
}

TEST(Process, HasAnIdentifier) {
  EXPECT_EQ(rt::Process::identifier(), getpid());
}

TEST(Process, HasAnotherIdentifierInTheChildOfAFork) {
  rt::Process::identifier();
  const pid_t child = fork();
  if (child == 0) _exit(rt::Process::identifier() == getpid() ? 0 : 1);
  int status = -1;
  ASSERT_EQ(waitpid(child, &status, 0), child);
  EXPECT_EQ(status, 0);
}

TEST(Process, DistinguishesUnsetEmptyAndSetVariables) {
  ASSERT_EQ(unsetenv("RT_PROCESS_TEST"), 0);
  EXPECT_TRUE(rt::Process::environmentValue("RT_PROCESS_TEST").isNull());
  ASSERT_EQ(setenv("RT_PROCESS_TEST", "", 1), 0);
  EXPECT_FALSE(rt::Process::environmentValue("RT_PROCESS_TEST").isNull());
  EXPECT_EQ(rt::Process::environmentValue("RT_PROCESS_TEST"), "");
  ASSERT_EQ(setenv("RT_PROCESS_TEST", " yes ", 1), 0);
  EXPECT_EQ(rt::Process::environmentValue("RT_PROCESS_TEST"), " yes ");
  ASSERT_EQ(unsetenv("RT_PROCESS_TEST"), 0);
}

TEST(Process, RepairsAValueThatIsNotUTF8) {
  ASSERT_EQ(setenv("RT_PROCESS_TEST",
                   "a\xff"
                   "b",
                   1),
            0);
  EXPECT_EQ(rt::Process::environmentValue("RT_PROCESS_TEST"),
            "a\xef\xbf\xbd"
            "b");
  ASSERT_EQ(unsetenv("RT_PROCESS_TEST"), 0);
}

}  // namespace
