// The descriptor owner (common/io/FileDescriptor.h): a descriptor is closed exactly once, by its
// last owner, and never when it was handed over.
#include <gtest/gtest.h>

#include <fcntl.h>
#include <unistd.h>

#include <utility>

#include "common/io/FileDescriptor.h"

using harmona::io::FileDescriptor;

namespace {

bool IsOpenDescriptor(int fd) {
    return fcntl(fd, F_GETFD) != -1;
}

int OpenNull() {
    return open("/dev/null", O_RDONLY | O_CLOEXEC);
}

TEST(FileDescriptorOwner, ClosesTheDescriptorWhenItLeavesScope) {
    const int fd = OpenNull();
    ASSERT_GE(fd, 0);
    {
        FileDescriptor owner(fd);
        EXPECT_TRUE(owner);
        EXPECT_EQ(owner.Get(), fd);
        EXPECT_TRUE(IsOpenDescriptor(fd));
    }
    EXPECT_FALSE(IsOpenDescriptor(fd));
}

TEST(FileDescriptorOwner, AnEmptyOwnerIsFalseAndClosesNothing) {
    FileDescriptor empty;
    EXPECT_FALSE(empty);
    EXPECT_EQ(empty.Get(), -1);
    EXPECT_TRUE(empty.Close());
    EXPECT_FALSE(FileDescriptor(-1));
}

TEST(FileDescriptorOwner, AMoveHandsTheDescriptorOverAndTheSourceClosesNothing) {
    const int fd = OpenNull();
    ASSERT_GE(fd, 0);
    FileDescriptor first(fd);
    FileDescriptor second(std::move(first));
    EXPECT_FALSE(first);
    EXPECT_EQ(second.Get(), fd);
    FileDescriptor third;
    third = std::move(second);
    EXPECT_FALSE(second);
    EXPECT_TRUE(IsOpenDescriptor(fd));
    third.Reset();
    EXPECT_FALSE(IsOpenDescriptor(fd));
}

TEST(FileDescriptorOwner, AssigningClosesTheDescriptorHeldBefore) {
    const int before = OpenNull();
    const int after = OpenNull();
    ASSERT_GE(before, 0);
    ASSERT_GE(after, 0);
    FileDescriptor owner(before);
    owner = FileDescriptor(after);
    EXPECT_FALSE(IsOpenDescriptor(before));
    EXPECT_TRUE(IsOpenDescriptor(after));
}

TEST(FileDescriptorOwner, ReleaseHandsTheDescriptorOutWithoutClosingIt) {
    const int fd = OpenNull();
    ASSERT_GE(fd, 0);
    {
        FileDescriptor owner(fd);
        EXPECT_EQ(owner.Release(), fd);
        EXPECT_FALSE(owner);
    }
    EXPECT_TRUE(IsOpenDescriptor(fd));
    close(fd);
}

TEST(FileDescriptorOwner, CloseReportsSuccessAndLeavesTheOwnerEmpty) {
    const int fd = OpenNull();
    ASSERT_GE(fd, 0);
    FileDescriptor owner(fd);
    EXPECT_TRUE(owner.Close());
    EXPECT_FALSE(owner);
    EXPECT_FALSE(IsOpenDescriptor(fd));
}

}  // namespace
