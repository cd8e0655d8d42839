// The file operations on the system's own overlapped files. A named pipe plays the device: one end is opened
// as a device file is, the test moves the other.
#include <gtest/gtest.h>

#include <array>
#include <cstring>
#include <string>
#include <thread>

#include "Platform/DeviceFiles.h"
#include "Platform/WaitableObjects.h"
#include "Platform/Win32/Windows.h"

namespace Varnholt::Platform {
namespace {

class SystemDeviceFilesTest : public testing::Test {
  protected:
    SystemDeviceFilesTest() : event_(MakeAutoResetEvent()) {
        farEnd_ = CreateNamedPipeA(Path, PIPE_ACCESS_DUPLEX | FILE_FLAG_OVERLAPPED, PIPE_TYPE_BYTE, 1, 4096,
                                   4096, 0, nullptr);
        file_ = SystemDeviceFiles().Open(Path);
        first_.event = event_.Get();
        second_.event = event_.Get();
    }
    ~SystemDeviceFilesTest() override {
        if (file_ != InvalidHandle()) {
            SystemDeviceFiles().CloseFile(file_);
        }
        CloseHandle(farEnd_);
    }

    void Send(const char* text) {
        OVERLAPPED record{};
        DWORD sent = 0;
        WriteFile(farEnd_, text, static_cast<DWORD>(std::strlen(text)), &sent, &record);
        ASSERT_TRUE(GetOverlappedResult(farEnd_, &record, &sent, TRUE));
    }
    /// Starts a read that finds nothing to read.
    void StartPendingRead(Overlapped& record, std::array<char, 8>& buffer) {
        ASSERT_FALSE(SystemDeviceFiles().Start(file_, Operation::Read(buffer.data(), buffer.size()), record));
        ASSERT_EQ(LastError(), Errors::IoPending);
    }
    std::uint32_t ResultOf(Overlapped& record, bool wait) {
        return SystemDeviceFiles().GetResult(file_, record, moved_, wait) ? Errors::Success : LastError();
    }

    static constexpr const char* Path = "\\\\.\\pipe\\ostra-test";
    HANDLE farEnd_;
    Handle file_;
    OwnedHandle event_;
    Overlapped first_, second_;
    std::array<char, 8> firstBuffer_{}, secondBuffer_{};
    std::uint32_t moved_ = 0;
};

TEST_F(SystemDeviceFilesTest, ReadCompletesWithWhatCameOrIsCancelled) {
    StartPendingRead(first_, firstBuffer_);
    EXPECT_EQ(ResultOf(first_, false), Errors::IoIncomplete);
    Send("abc");
    EXPECT_EQ(Wait(event_.Get(), 2000), WaitResult::Signalled);
    EXPECT_EQ(ResultOf(first_, false), Errors::Success);
    EXPECT_EQ(std::string(firstBuffer_.data(), moved_), "abc");
    StartPendingRead(second_, secondBuffer_);
    EXPECT_TRUE(SystemDeviceFiles().CancelTransfers(file_));
    EXPECT_EQ(ResultOf(second_, true), Errors::OperationAborted);
    EXPECT_EQ(moved_, 0U);
}

TEST_F(SystemDeviceFilesTest, ClosingEndsThePendingRead) {
    StartPendingRead(first_, firstBuffer_);
    const Handle closed = std::exchange(file_, InvalidHandle());
    EXPECT_TRUE(SystemDeviceFiles().CloseFile(closed));
    EXPECT_EQ(Wait(event_.Get(), 2000), WaitResult::Signalled);
    EXPECT_NE(first_.internal, static_cast<std::uintptr_t>(STATUS_PENDING));
}

TEST_F(SystemDeviceFilesTest, ResultIsWaitedForAlthoughTheSignalWasUsedUp) {
    StartPendingRead(first_, firstBuffer_);
    StartPendingRead(second_, secondBuffer_);
    Send("abc");
    EXPECT_EQ(Wait(event_.Get(), 2000), WaitResult::Signalled);
    Send("de");
    EXPECT_EQ(Wait(event_.Get(), 2000), WaitResult::Signalled);
    EXPECT_EQ(ResultOf(second_, true), Errors::Success);
    EXPECT_EQ(std::string(secondBuffer_.data(), moved_), "de");
    EXPECT_EQ(ResultOf(first_, true), Errors::Success);
}

TEST_F(SystemDeviceFilesTest, WaitingForOneResultLeavesTheSignalOfTheOther) {
    StartPendingRead(first_, firstBuffer_);
    StartPendingRead(second_, secondBuffer_);
    std::thread sender([this] {
        Sleep(50);
        Send("abc");
        Sleep(50);
        Send("de");
    });
    EXPECT_EQ(ResultOf(second_, true), Errors::Success);
    sender.join();
    EXPECT_EQ(Wait(event_.Get(), 0), WaitResult::Signalled);
}

}  // namespace
}  // namespace Varnholt::Platform
