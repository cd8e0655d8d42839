// The file operations on the system's own overlapped files. A named pipe plays the device: one end is opened
// as a device file is, the test moves the other.
#include <gtest/gtest.h>

#include <array>
#include <cstring>
#include <string>
#include <thread>

#include "Platform/DeviceFiles.h"
#include "Platform/OverlappedRequest.h"
#include "Platform/WaitableObjects.h"
#include "Platform/Win32/Windows.h"

namespace Varnholt::Platform {
namespace {

class SystemDeviceFilesTest : public testing::Test {
  protected:
    SystemDeviceFilesTest() : event(MakeAutoResetEvent()) {
        farEnd = CreateNamedPipeA(Path, PIPE_ACCESS_DUPLEX | FILE_FLAG_OVERLAPPED, PIPE_TYPE_BYTE, 1, 4096,
                                  4096, 0, nullptr);
        file = SystemDeviceFiles().Open(Path);
        first.event = event.Get();
        second.event = event.Get();
    }
    ~SystemDeviceFilesTest() override {
        if (file != InvalidHandle()) {
            SystemDeviceFiles().CloseFile(file);
        }
        CloseHandle(farEnd);
    }

    void Send(const char* text) {
        OVERLAPPED record{};
        DWORD sent = 0;
        WriteFile(farEnd, text, static_cast<DWORD>(std::strlen(text)), &sent, &record);
        ASSERT_TRUE(GetOverlappedResult(farEnd, &record, &sent, TRUE));
    }
    /// Starts a read that finds nothing to read.
    void StartPendingRead(Overlapped& record, std::array<char, 8>& buffer) {
        ASSERT_FALSE(SystemDeviceFiles().StartRead(file, buffer.data(), buffer.size(), record));
        ASSERT_EQ(LastError(), Errors::IoPending);
    }
    std::uint32_t ResultOf(Overlapped& record, bool wait) {
        return SystemDeviceFiles().GetResult(file, record, moved, wait) ? Errors::Success : LastError();
    }

    static constexpr const char* Path = "\\\\.\\pipe\\ostra-test";
    HANDLE farEnd;
    Handle file;
    OwnedHandle event;
    Overlapped first, second;
    std::array<char, 8> firstBuffer{}, secondBuffer{};
    std::uint32_t moved = 0;
};

TEST_F(SystemDeviceFilesTest, WhatIsNotThereIsNotOpened) {
    EXPECT_EQ(SystemDeviceFiles().Open("\\\\.\\no-such-device"), InvalidHandle());
    EXPECT_EQ(LastError(), Errors::FileNotFound);
}

TEST_F(SystemDeviceFilesTest, ReadCompletesWithWhatCame) {
    StartPendingRead(first, firstBuffer);
    EXPECT_EQ(ResultOf(first, false), Errors::IoIncomplete);
    Send("abc");
    EXPECT_EQ(Wait(event.Get(), 2000), WaitResult::Signalled);
    EXPECT_EQ(ResultOf(first, false), Errors::Success);
    EXPECT_EQ(std::string(firstBuffer.data(), moved), "abc");
}

TEST_F(SystemDeviceFilesTest, CancelledReadEndsAborted) {
    StartPendingRead(first, firstBuffer);
    EXPECT_TRUE(SystemDeviceFiles().CancelTransfers(file));
    EXPECT_EQ(ResultOf(first, true), Errors::OperationAborted);
    EXPECT_EQ(moved, 0U);
}

TEST_F(SystemDeviceFilesTest, ClosingEndsThePendingRead) {
    StartPendingRead(first, firstBuffer);
    const Handle closed = std::exchange(file, InvalidHandle());
    EXPECT_TRUE(SystemDeviceFiles().CloseFile(closed));
    EXPECT_EQ(Wait(event.Get(), 2000), WaitResult::Signalled);
    EXPECT_NE(first.internal, static_cast<std::uintptr_t>(STATUS_PENDING));
}

TEST_F(SystemDeviceFilesTest, ResultIsWaitedForAlthoughTheSignalWasUsedUp) {
    StartPendingRead(first, firstBuffer);
    StartPendingRead(second, secondBuffer);
    Send("abc");
    EXPECT_EQ(Wait(event.Get(), 2000), WaitResult::Signalled);
    Send("de");
    EXPECT_EQ(Wait(event.Get(), 2000), WaitResult::Signalled);
    EXPECT_EQ(ResultOf(second, true), Errors::Success);
    EXPECT_EQ(std::string(secondBuffer.data(), moved), "de");
    EXPECT_EQ(ResultOf(first, true), Errors::Success);
}

TEST_F(SystemDeviceFilesTest, WaitingForOneResultLeavesTheSignalOfTheOther) {
    StartPendingRead(first, firstBuffer);
    StartPendingRead(second, secondBuffer);
    std::thread sender([this] {
        Sleep(50);
        Send("abc");
        Sleep(50);
        Send("de");
    });
    EXPECT_EQ(ResultOf(second, true), Errors::Success);
    sender.join();
    EXPECT_EQ(Wait(event.Get(), 0), WaitResult::Signalled);
}

TEST_F(SystemDeviceFilesTest, RequestEndsItsReadBeforeItsBufferGoes) {
    {
        std::array<char, 8> buffer{};
        OverlappedRequest request(event.Get());
        request.StartRead(file, buffer.data(), buffer.size());
        EXPECT_TRUE(request.IsRunning());
    }
    // Nobody is left to take these bytes but the next read.
    Send("abc");
    EXPECT_TRUE(SystemDeviceFiles().StartRead(file, firstBuffer.data(), firstBuffer.size(), first));
    EXPECT_EQ(ResultOf(first, false), Errors::Success);
    EXPECT_EQ(std::string(firstBuffer.data(), moved), "abc");
}

TEST_F(SystemDeviceFilesTest, PipeRefusesDeviceControls) {
    EXPECT_FALSE(
        SystemDeviceFiles().StartControl(file, 0x22000D, "0123456789", 10, firstBuffer.data(), 8, first));
    EXPECT_NE(LastError(), Errors::IoPending);
}

}  // namespace
}  // namespace Varnholt::Platform
