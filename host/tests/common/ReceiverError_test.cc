#include "common/ReceiverError.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <system_error>

namespace receiver {
namespace {

TEST(ReceiverError, AThreadThatCannotBeStartedIsToldWithWhatToDo) {
    const std::system_error error(EAGAIN, std::generic_category());
    EXPECT_EQ(SentenceOf(error),
              "the system starts no more threads: Resource temporarily unavailable; find what uses them up "
              "(ulimit -u, TasksMax=).");
}

TEST(ReceiverError, OtherErrorsSpeakForThemselves) {
    EXPECT_EQ(SentenceOf(std::runtime_error("it is so")), "it is so");
    EXPECT_EQ(SentenceOf(std::system_error(EIO, std::generic_category(), "read")),
              "read: Input/output error");
}

}  // namespace
}  // namespace receiver
