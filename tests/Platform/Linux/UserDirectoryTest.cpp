#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <functional>

#include "Platform/ErrorCodes.h"
#include "Platform/Linux/UserDirectory.h"
#include "TestThread.h"
#include "UniqueName.h"

namespace Varnholt::Platform {
namespace {

using Linux::UserDirectory;

/// Stands for the machine's shared memory.
class UserDirectories : public testing::Test {
  protected:
    void SetUp() override { std::filesystem::create_directory(above_); }
    void TearDown() override { std::filesystem::remove_all(above_); }

    const std::string above_ = testing::TempDir() + UniqueName("shared-memory");
    const std::string first_ = above_ + "/ostra-" + std::to_string(geteuid());
};

TEST_F(UserDirectories, AreFoundBesideWhatOthersPutInTheirPlace) {
    const std::vector<std::pair<const char*, std::function<bool(const std::string&)>>> squatters{
        {"file", [](const std::string& name) { return std::ofstream(name).is_open(); }},
        {"named pipe", [](const std::string& name) { return mkfifo(name.c_str(), 0600) == 0; }},
        {"link to a directory of ours",
         [](const std::string& name) { return symlink(testing::TempDir().c_str(), name.c_str()) == 0; }},
        {"link to nothing",
         [](const std::string& name) { return symlink("/nonexistent", name.c_str()) == 0; }},
        {"directory of another user",
         [](const std::string& name) {
             return mkdir(name.c_str(), 0777) == 0 && chown(name.c_str(), 1, 1) == 0;
         }},
    };
    std::string expected = first_;
    int taken = 0;
    for (const auto& [text, make] : squatters) {
        SCOPED_TRACE(text);
        if (!make(expected)) {
            EXPECT_NE(geteuid(), 0u);  // only root can give a directory away
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
}

}  // namespace
}  // namespace Varnholt::Platform
