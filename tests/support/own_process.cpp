#include "support/own_process.h"

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <iostream>

namespace test {

bool InOwnProcess(const std::function<void()>& work) {
  std::cout.flush();
  const pid_t child = fork();
  if (child == 0) {
    work();
    std::cout.flush();
    _exit(::testing::Test::HasFailure() ? 1 : 0);
  }
  int status = 0;
  return child > 0 && waitpid(child, &status, 0) == child && WIFEXITED(status) &&
         WEXITSTATUS(status) == 0;
}

}  // namespace test
