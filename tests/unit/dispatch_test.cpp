#include <gtest/gtest.h>

#include "core/command.h"
#include "core/dispatch.h"

TEST(Dispatch, FormClasses) {
  EXPECT_EQ(classify_command_form("AT+JVCN"), OP_ACTION);
}
