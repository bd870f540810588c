// What ends the process, run in a child.
#pragma once

#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdio>
#include <string>

/// Dies in a child, of whose output the death test reads standard output only.
#define EXPECT_FATAL(statement, status, line)                              \
  do {                                                                     \
    std::fflush(stdout); /* or the child repeats what is still buffered */ \
    EXPECT_EXIT(                                                           \
        {                                                                  \
          dup2(STDERR_FILENO, STDOUT_FILENO);                              \
          close(STDERR_FILENO);                                            \
          statement;                                                       \
        },                                                                 \
        testing::ExitedWithCode(status), testing::Eq(std::string(line)));  \
  } while (false)
