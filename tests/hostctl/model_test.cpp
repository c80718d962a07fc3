#include <gtest/gtest.h>

#include "hostctl/session.h"

TEST(DefaultHost, IsAValidDocument) {
    EXPECT_NO_THROW(HostCtl::Lib::HostSession::ValidateDocument(HostCtl::Lib::HostSession::DefaultDocument(), "default"));
}
