// Replacing a file whole (common/io/ReplaceFile.h): the new text under the old name, nothing else
// left in the folder, the mode asked for whatever the umask, a link at the name replaced rather
// than followed, and a file that must be new never overwriting one that is there.
#include <gtest/gtest.h>

#include <fcntl.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <fstream>
#include <set>
#include <sstream>
#include <string>

#include "common/io/DirectoryReader.h"
#include "common/io/FileDescriptor.h"
#include "common/io/ReplaceFile.h"

using harmona::io::DirectoryReader;
using harmona::io::FileDescriptor;
using harmona::io::ReplaceFileAt;
using harmona::io::ReplaceOutcome;

namespace {

class ReplaceFile : public ::testing::Test {
  protected:
    void SetUp() override {
        char pattern[] = "/tmp/replace-XXXXXX";
        ASSERT_NE(mkdtemp(pattern), nullptr);
        folder_ = pattern;
        dir_ = FileDescriptor(open(folder_.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
        ASSERT_TRUE(dir_);
    }

    std::string Path(const char* name) const { return folder_ + "/" + name; }

    std::string Read(const char* name) const {
        std::ifstream in(Path(name));
        std::ostringstream text;
        text << in.rdbuf();
        return text.str();
    }

    std::set<std::string> Names() const {
        std::set<std::string> names;
        DirectoryReader reader(
            FileDescriptor(open(folder_.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC)));
        while (const dirent* entry = reader.Next())
            if (std::string(entry->d_name) != "." && std::string(entry->d_name) != "..")
                names.insert(entry->d_name);
        return names;
    }

    std::string folder_;
    FileDescriptor dir_;
};

TEST_F(ReplaceFile, TheNewTextStandsUnderTheOldNameAndNothingElseIsLeft) {
    std::ofstream(Path("list")) << "old text, longer than the new one\n";
    ASSERT_EQ(ReplaceFileAt(dir_.Get(), "list", "new\n", ".tmp-list-"), ReplaceOutcome::ok);
    EXPECT_EQ(Read("list"), "new\n");
    EXPECT_EQ(Names(), std::set<std::string>{"list"});
}

TEST_F(ReplaceFile, TheFileGetsTheModeAskedForWhateverTheUmask) {
    const mode_t old = umask(0077);
    ASSERT_EQ(ReplaceFileAt(dir_.Get(), "open", "x", ".tmp-", {0644}), ReplaceOutcome::ok);
    umask(old);
    struct stat st {};
    ASSERT_EQ(stat(Path("open").c_str(), &st), 0);
    EXPECT_EQ(st.st_mode & 07777, 0644u);
}

TEST_F(ReplaceFile, ALinkAtTheNameIsReplacedNotFollowed) {
    std::ofstream(Path("elsewhere")) << "untouched";
    ASSERT_EQ(symlink(Path("elsewhere").c_str(), Path("list").c_str()), 0);
    ASSERT_EQ(ReplaceFileAt(dir_.Get(), "list", "new", ".tmp-"), ReplaceOutcome::ok);
    struct stat st {};
    ASSERT_EQ(lstat(Path("list").c_str(), &st), 0);
    EXPECT_TRUE(S_ISREG(st.st_mode));
    EXPECT_EQ(Read("elsewhere"), "untouched");
}

TEST_F(ReplaceFile, AFileThatMustBeNewLeavesTheOneThereAlone) {
    std::ofstream(Path("taken")) << "first";
    EXPECT_EQ(ReplaceFileAt(dir_.Get(), "taken", "second", ".tmp-", {0600, true}),
              ReplaceOutcome::exists);
    EXPECT_EQ(Read("taken"), "first");
    EXPECT_EQ(Names(), std::set<std::string>{"taken"});
    EXPECT_EQ(ReplaceFileAt(dir_.Get(), "fresh", "new", ".tmp-", {0600, true}), ReplaceOutcome::ok);
    EXPECT_EQ(Read("fresh"), "new");
}

TEST_F(ReplaceFile, AFolderInTheWayFailsWithItsCauseAndLeavesNoTemporaryFile) {
    ASSERT_EQ(mkdir(Path("busy").c_str(), 0755), 0);
    ASSERT_EQ(mkdir(Path("busy/inside").c_str(), 0755), 0);
    EXPECT_EQ(ReplaceFileAt(dir_.Get(), "busy", "text", ".tmp-"), ReplaceOutcome::failed);
    EXPECT_TRUE(errno == EISDIR || errno == ENOTEMPTY || errno == EEXIST) << errno;
    EXPECT_EQ(Names(), std::set<std::string>{"busy"});
}

}  // namespace
