#include <fcntl.h>
#include <sys/file.h>
#include <sys/resource.h>
#include <sys/stat.h>

#include <filesystem>
#include <fstream>
#include <set>

#include "ForkedProcess.h"
#include "Platform/EventScheduler.h"
#include "Platform/Linux/SharedFile.h"
#include "TestThread.h"
#include "UniqueName.h"

namespace Varnholt::Platform {
namespace {

using Linux::SharedFile;
using Linux::UserDirectory;

/// Puts something in the place of a file or a directory of ours; false where only root can do that.
using Squatter = bool (*)(const std::string& path);
constexpr Squatter File = [](const std::string& path) { return std::ofstream(path).is_open(); };
constexpr Squatter Directory = [](const std::string& path) { return mkdir(path.c_str(), 0777) == 0; };
constexpr Squatter Pipe = [](const std::string& path) { return mkfifo(path.c_str(), 0600) == 0; };
constexpr Squatter Link = [](const std::string& path) { return symlink(".", path.c_str()) == 0; };
constexpr Squatter DeadLink = [](const std::string& path) { return symlink("/none", path.c_str()) == 0; };
template <Squatter Make>
bool GivenAway(const std::string& path) {
    return geteuid() == 0 && Make(path) && chown(path.c_str(), 1, 1) == 0;
}

std::string PathOf(const std::string& name) {
    return UserDirectory::Open()->Path() + "/" + SharedFile::FileNameOf("mutex", name);
}

/// A name whose file the test may tamper with.
class SharedFiles : public testing::Test {
  protected:
    void TearDown() override { std::filesystem::remove(path_); }

    const std::string name_ = UniqueName("tampered");
    const std::string path_ = PathOf(name_);
};

bool CanBeUsed(const OwnedHandle& mutex) {
    return mutex && Wait(mutex.Get(), 0) == WaitResult::Signalled && ReleaseMutex(mutex.Get());
}

TEST_F(SharedFiles, AreTheUsersOwnAndGoWithTheLastHandle) {
    OwnedHandle first(MakeMutex(name_));
    OwnedHandle second(MakeMutex(name_));
    struct stat state {};
    ASSERT_EQ(stat(path_.c_str(), &state), 0);
    EXPECT_EQ(state.st_mode & 0777, 0600u);
    EXPECT_EQ(state.st_uid, geteuid());
    first.Reset();
    EXPECT_TRUE(std::filesystem::exists(path_));
    second.Reset();
    EXPECT_FALSE(std::filesystem::exists(path_));
    first = OwnedHandle(MakeMutex(name_));
    std::filesystem::remove(path_);
    std::ofstream{path_};
    first.Reset();
    EXPECT_TRUE(std::filesystem::exists(path_)) << "it is another's now";
}

TEST_F(SharedFiles, WithOtherContentAreReplacedUnlessInUse) {
    const OwnedHandle other(MakeMutex(UniqueName("size")));
    const std::size_t size = std::filesystem::file_size(PathOf(UniqueName("size")));
    for (const std::string& content :
         {std::string(), std::string("OSTRA"), std::string(4096, '\xFF'), std::string(size, '\x5A')}) {
        SCOPED_TRACE(content.size());
        std::ofstream(path_) << content;
        const int user = open(path_.c_str(), O_RDONLY | O_CLOEXEC);
        ASSERT_EQ(flock(user, LOCK_SH), 0);
        EXPECT_EQ(ErrorOf(MakeMutex(name_) != NoHandle), Errors::InvalidData);
        close(user);
        EXPECT_TRUE(CanBeUsed(OwnedHandle(MakeMutex(name_))));
        EXPECT_FALSE(std::filesystem::exists(path_));
    }
}

TEST_F(SharedFiles, ThatAreNoFilesOfOursAreRefused) {
    for (const Squatter squatter : {Link, DeadLink, Directory, Pipe, &GivenAway<File>}) {
        if (!squatter(path_)) {
            EXPECT_NE(geteuid(), 0u);
            continue;
        }
        EXPECT_EQ(ErrorOf(MakeMutex(name_) != NoHandle), Errors::AccessDenied);
        std::filesystem::remove(path_);
    }
}

/// A process that died left its file behind, and in it a mutex that is still owned.
TEST_F(SharedFiles, OfTheDeadAreTakenOver) {
    ForkedProcess dying([this] { return static_cast<int>(Wait(MakeMutex(name_), 0)); });
    EXPECT_EQ(dying.WaitForExit(), static_cast<int>(WaitResult::Signalled));
    ASSERT_TRUE(std::filesystem::exists(path_));
    const OwnedHandle mutex(MakeMutex(name_));
    EXPECT_EQ(Wait(mutex.Get(), 0), WaitResult::Abandoned);
    EXPECT_TRUE(ReleaseMutex(mutex.Get()));
    const OwnedHandle made(MakeMutex(UniqueName("made")));
    const std::string directory = UserDirectory::Open()->Path();
    std::error_code ignored;
    for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fd")) {
        if (std::filesystem::read_symlink(entry, ignored).string().starts_with(directory)) {
            EXPECT_EQ(fcntl(std::stoi(entry.path().filename()), F_GETFD), FD_CLOEXEC)
                << "no child's business, whether made or taken over";
        }
    }
}

/// Somebody who keeps the file locked for himself makes it unusable, but holds nobody up for good.
TEST_F(SharedFiles, ThatAreLockedAreBusy) {
    std::ofstream{path_};
    const int user = open(path_.c_str(), O_RDONLY | O_CLOEXEC);
    ASSERT_EQ(flock(user, LOCK_EX), 0);
    const std::uint64_t start = ClockScheduler().Now();
    EXPECT_EQ(ErrorOf(MakeMutex(name_) != NoHandle), Errors::Busy);
    EXPECT_GT(ClockScheduler().Now() - start, 100'000U) << "for whom the file is about to go";
    close(user);
}

TEST(SharedFileNames, AreFileNamesOfBoundedLengthAndDiffer) {
    const std::string path = R"(\\?\usb#vid_04b4&pid_8613#5&1c&0&2#{00873fdf-61a8-11d1})", slashes(500, '/');
    std::set<std::string> fileNames;
    for (const std::string& name : {std::string("a"), std::string("A"), std::string("a/b"),
                                    std::string("a%2Fb"), path, slashes, slashes + "a", slashes + "b"}) {
        const std::string fileName = SharedFile::FileNameOf("mutex", name);
        EXPECT_EQ(fileName.find('/'), std::string::npos) << fileName;
        EXPECT_LE(fileName.size(), 200u);
        EXPECT_TRUE(fileNames.insert(fileName).second) << fileName;
    }
    EXPECT_EQ(SharedFile::FileNameOf("semaphore", "azAZ09_-`{@[/:"), "semaphore.azAZ09_-%60%7B%40%5B%2F%3A");
}

/// Stands for the machine's shared memory.
class UserDirectories : public testing::Test {
  protected:
    void SetUp() override { std::filesystem::create_directory(above_); }
    void TearDown() override { std::filesystem::remove_all(above_); }

    const std::string above_ = testing::TempDir() + UniqueName("shared-memory");
    const std::string first_ = above_ + "/ostra-" + std::to_string(geteuid());
};

TEST_F(UserDirectories, AreFoundBesideWhatOthersPutInTheirPlace) {
    EXPECT_EQ(UserDirectory::Open(above_)->Path(), first_);
    std::filesystem::remove(first_);
    std::string expected = first_;
    int taken = 0;
    for (const Squatter squatter : {File, Pipe, Link, DeadLink, &GivenAway<Directory>}) {
        SCOPED_TRACE(taken);
        if (!squatter(expected)) {
            EXPECT_NE(geteuid(), 0u);
            break;
        }
        expected = first_ + "." + std::to_string(++taken);
        struct stat state {};
        for (int time = 0; time < 2; ++time) {  // makes it, and finds it
            const auto directory = UserDirectory::Open(above_);
            ASSERT_TRUE(directory);
            EXPECT_EQ(directory->Path(), expected);
            ASSERT_EQ(fstat(directory->Descriptor(), &state), 0);
            EXPECT_EQ(state.st_uid, geteuid());
            EXPECT_EQ(state.st_mode & 0777, 0700u);
        }
        std::filesystem::remove(expected);
    }
}

TEST_F(UserDirectories, SayWhyTheyCannotBeHad) {
    std::ofstream{above_ + "/file"};
    EXPECT_EQ(ErrorOf(UserDirectory::Open(above_ + "/nothing") != nullptr), Errors::FileNotFound);
    EXPECT_EQ(ErrorOf(UserDirectory::Open(above_ + "/file") != nullptr), Errors::PathNotFound);
    ForkedProcess withoutFiles([this] {
        const rlimit none{};
        setrlimit(RLIMIT_NOFILE, &none);
        return ErrorOf(UserDirectory::Open(above_) != nullptr) == Errors::NoSystemResources ? 0 : 1;
    });
    EXPECT_EQ(withoutFiles.WaitForExit(), 0);
}

}  // namespace
}  // namespace Varnholt::Platform
