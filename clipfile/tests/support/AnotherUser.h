#pragma once

#include <gtest/gtest.h>
#include <unistd.h>

/// Root may read and write everything: it is somebody else meanwhile.
class AnotherUser {
 public:
    AnotherUser() : isRoot_(geteuid() == 0), isOther_(!isRoot_ || seteuid(65534) == 0) {}
    ~AnotherUser() {
        if (isRoot_ && seteuid(0) != 0) {
            ADD_FAILURE() << "root stays another user";
        }
    }
    AnotherUser(const AnotherUser&) = delete;
    AnotherUser& operator=(const AnotherUser&) = delete;
    bool IsOther() const { return isOther_; }

 private:
    bool isRoot_;
    bool isOther_;
};
