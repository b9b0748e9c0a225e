// The directory stream owner (common/io/DirectoryReader.h): it reads every entry of the folder it
// was given, closes the folder's descriptor with the stream, and refuses what is not a folder.
#include <gtest/gtest.h>

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <set>
#include <string>
#include <utility>

#include "common/io/DirectoryReader.h"

using harmona::io::DirectoryReader;
using harmona::io::FileDescriptor;

namespace {

FileDescriptor OpenFolder(const char* path) {
    return FileDescriptor(open(path, O_RDONLY | O_DIRECTORY | O_CLOEXEC));
}

TEST(DirectoryReaderOwner, ReadsEveryEntryThenClosesTheFoldersDescriptor) {
    mkdir("/tmp/folder", 0755);
    for (const char* name : {"/tmp/folder/a", "/tmp/folder/b"})
        close(open(name, O_WRONLY | O_CREAT | O_CLOEXEC, 0644));
    mkdir("/tmp/folder/c", 0755);
    FileDescriptor folder = OpenFolder("/tmp/folder");
    ASSERT_TRUE(folder);
    const int fd = folder.Get();
    std::set<std::string> names;
    {
        DirectoryReader reader(std::move(folder));
        ASSERT_TRUE(reader);
        EXPECT_EQ(reader.Fd(), fd);
        while (const dirent* entry = reader.Next())
            names.insert(entry->d_name);
        EXPECT_EQ(errno, 0);  // the end, not a read error
    }
    EXPECT_EQ(names, (std::set<std::string>{".", "..", "a", "b", "c"}));
    EXPECT_EQ(fcntl(fd, F_GETFD), -1);
}

TEST(DirectoryReaderOwner, AnEmptyDescriptorOrAFileGivesAnEmptyReaderAndNoLeak) {
    EXPECT_FALSE(DirectoryReader(FileDescriptor()));
    close(open("/tmp/file", O_WRONLY | O_CREAT | O_CLOEXEC, 0644));
    FileDescriptor file(open("/tmp/file", O_RDONLY | O_CLOEXEC));
    ASSERT_TRUE(file);
    const int fd = file.Get();
    EXPECT_FALSE(DirectoryReader(std::move(file)));
    EXPECT_EQ(fcntl(fd, F_GETFD), -1);
}

TEST(DirectoryReaderOwner, AMoveHandsTheStreamOver) {
    DirectoryReader first(OpenFolder("/tmp"));
    ASSERT_TRUE(first);
    DirectoryReader second(std::move(first));
    EXPECT_FALSE(first);
    ASSERT_TRUE(second);
    EXPECT_NE(second.Next(), nullptr);
}

}  // namespace
