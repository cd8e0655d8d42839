// Server and client together, over the sockets that programs use.
#include <arpa/inet.h>
#include <gtest/gtest.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

#include "Platform/Usb/SimulatorAddress.h"
#include "Platform/Usb/SimulatorBus.h"
#include "Platform/Usb/SystemUsbBus.h"
#include "Platform/Usb/UsbIpDevice.h"
#include "Protocol/ByteOrder.h"
#include "Simulator/ServerThread.h"
#include "Support/TestTransfer.h"
#include "UsbIpServer.h"

namespace Varnholt::Simulator {
namespace {

using Bytes = std::vector<std::uint8_t>;
using Platform::Usb::ListSimulators;
using Platform::Usb::SimulatorBus;
using Platform::Usb::SimulatorInfo;
using Platform::Usb::TransferStatus;
using Platform::Usb::UsbDevice;
using Protocol::BulkInEndpoint;
using Protocol::BulkOutEndpoint;
using Protocol::InterruptInEndpoint;
using Protocol::Request;
using Tests::TestTransfer;
namespace Errors = Platform::Errors;
namespace UsbIp = Platform::Usb::UsbIp;

/// Does a transfer and answers the bytes that came.
Bytes Do(UsbDevice& device, TestTransfer&& transfer) {
    EXPECT_EQ(Errors::Success, device.Submit(transfer));
    EXPECT_TRUE(transfer.Wait());
    EXPECT_EQ(TransferStatus::Completed, transfer.status);
    return transfer.Data();
}

class UsbIpServerTest : public testing::Test {
  protected:
    static std::shared_ptr<UsbDevice> Open(const std::string& name) {
        Platform::ErrorCode error = Errors::Success;
        auto device = SimulatorBus().Open("simulated-" + name, error);
        EXPECT_EQ(Errors::Success, error);
        return device;
    }
    static std::shared_ptr<UsbDevice> OpenAndClaim(const std::string& name) {
        auto device = Open(name);
        EXPECT_EQ(Errors::Success, device->Claim());
        return device;
    }
    static bool Listed(const std::string& name) {
        const auto names = SimulatorBus().List();
        return std::ranges::find(names, "simulated-" + name) != names.end();
    }
    static SimulatorInfo Describe(const std::string& name) {
        for (const SimulatorInfo& info : ListSimulators()) {
            if (info.name == "simulated-" + name) {
                return info;
            }
        }
        ADD_FAILURE() << name << " is not there";
        return {};
    }

    const std::string name_ = ServerThread::UniqueName("a");
    ServerThread server_;
};

TEST_F(UsbIpServerTest, InstrumentsAreListedByNameForAsLongAsTheyAreThere) {
    const std::string other = ServerThread::UniqueName("b");
    EXPECT_FALSE(Listed(name_));
    server_.Add(other);
    server_.Add(name_);
    std::vector<std::string> names = Platform::Usb::SystemUsbBus().List();
    std::erase_if(names, [&](const std::string& each) {
        return each != "simulated-" + name_ && each != "simulated-" + other;
    });
    EXPECT_EQ((std::vector<std::string>{"simulated-" + name_, "simulated-" + other}), names);
    EXPECT_THROW(server_.Add(name_), std::runtime_error);
    EXPECT_THROW(server_.Add("a/b"), std::runtime_error);
    const SimulatorInfo info = Describe(name_);
    EXPECT_TRUE(info.usable);
    EXPECT_EQ(getpid(), info.processId);
    EXPECT_EQ(geteuid(), info.userId);

    Platform::ErrorCode error = Errors::Success;
    for (const char* const unknown : {"simulated-nobody", "simulated-", "simulated-a/b", "usb-1-1"}) {
        EXPECT_EQ(nullptr, SimulatorBus().Open(unknown, error)) << unknown;
        EXPECT_EQ(Errors::FileNotFound, error) << unknown;
    }
}

TEST_F(UsbIpServerTest, MemoryTravelsBothWays) {
    const auto instrument = server_.Add(name_);
    const auto device = Open(name_);
    Platform::ErrorCode error = Errors::Busy;
    const auto endpoints = device->Endpoints(error);
    EXPECT_EQ(Errors::Success, error);
    ASSERT_EQ(3U, endpoints.size());
    EXPECT_EQ(BulkOutEndpoint, endpoints[0].address);
    EXPECT_FALSE(instrument->Claimed()) << "the question for the endpoints has ended its claim";
    ASSERT_EQ(Errors::Success, device->Claim());
    Do(*device, TestTransfer::Memory(Request::WriteEeprom, 300, 3));
    for (const Bytes& sent : {Bytes{1, 2, 3}, Bytes{0}, Bytes{0}}) {
        Do(*device, TestTransfer::Out(BulkOutEndpoint, sent));
    }
    Do(*device, TestTransfer::Memory(Request::ReadEeprom, 299, 5));
    const Bytes memory = Do(*device, TestTransfer::In(BulkInEndpoint, 5));
    EXPECT_EQ((Bytes{1, 2, 3}), Bytes(memory.begin() + 1, memory.begin() + 4));
}

/// A megabyte does not go into a socket at once.
TEST_F(UsbIpServerTest, LargeTransfersArriveWhole) {
    constexpr std::uint32_t piece = 1U << 20U;
    InstrumentSettings settings;
    settings.scanBytes = 3 * piece + 1000;
    const auto instrument = server_.Add(name_, settings);
    const auto device = OpenAndClaim(name_);
    Do(*device, TestTransfer::Vendor(Request::Measure, {}));
    Bytes all;
    for (std::size_t before = 0; all.empty() || all.size() - before == piece;) {
        before = all.size();
        const Bytes data = Do(*device, TestTransfer::In(BulkInEndpoint, piece));
        all.insert(all.end(), data.begin(), data.end());
    }
    const auto expected = [&](Commands& state) { return state.Answers().Expected(0, settings.scanBytes); };
    server_.Do([&] { EXPECT_EQ(instrument->WithCommands(expected), all); });
}

TEST_F(UsbIpServerTest, OneProgramAtATime) {
    const auto instrument = server_.Add(name_);
    const auto first = OpenAndClaim(name_);
    const auto second = Open(name_);
    EXPECT_EQ(Errors::Busy, second->Claim());
    EXPECT_NE(std::string::npos, Describe(name_).usedBy.find("process " + std::to_string(getpid())))
        << Describe(name_).usedBy;
    first->Release();
    EXPECT_EQ(Errors::Success, second->Claim()) << "free as soon as it is released";
    second->Release();
    EXPECT_EQ("", Describe(name_).usedBy);
}

TEST_F(UsbIpServerTest, FaultsCrossTheConnection) {
    server_.Add(name_, {},
                "bulk-in 0:io-error; bulk-in 1:overflow; bulk-in 2:stall; bulk-in 4:late-cancel; control "
                "3:gone-before");
    for (int round = 0; round < 2; ++round) {
        const auto device = OpenAndClaim(name_);
        for (const auto status :
             {TransferStatus::IoError, TransferStatus::Overflow, TransferStatus::Stalled}) {
            TestTransfer failing = TestTransfer::In(BulkInEndpoint, 64);
            device->Submit(failing);
            ASSERT_TRUE(failing.Wait());
            EXPECT_EQ(status, failing.status);
        }
        ASSERT_EQ(Errors::Success, device->ClearHalt(BulkInEndpoint));

        Do(*device, TestTransfer::Memory(Request::ReadEeprom, 4096, 64));
        EXPECT_EQ(0x01, Do(*device, TestTransfer::In(BulkInEndpoint, 2))[1]);
        TestTransfer late = TestTransfer::In(BulkInEndpoint, 64);
        device->Submit(late);
        Do(*device, TestTransfer::Vendor(Request::ButtonReport, {}));
        EXPECT_EQ(0, late.completions);
        device->Cancel(late);
        ASSERT_TRUE(late.Wait());
        EXPECT_EQ(TransferStatus::Cancelled, late.status);
        EXPECT_EQ(62U, late.actualLength);

        Do(*device, TestTransfer::Vendor(Request::Reset, {31}));
        TestTransfer gone = TestTransfer::Vendor(Request::Reset, {31});
        ASSERT_EQ(Errors::Success, device->Submit(gone));
        ASSERT_TRUE(gone.Wait());
        EXPECT_EQ(TransferStatus::DeviceGone, gone.status);
    }
}

TEST_F(UsbIpServerTest, PeerThatStopsWhereItIsDueIsGivenUp) {
    const auto instrument = server_.Add(name_);
    const auto operation =
        UsbIp::Encode(UsbIp::OperationHeader{UsbIp::ProtocolVersion, UsbIp::Operation::ImportRequest, {}});
    const auto busId = UsbIp::EncodeBusId(Platform::Usb::SimulatorBusId);
    Bytes import(operation.begin(), operation.end());
    import.insert(import.end(), busId.begin(), busId.end());
    UsbIp::SubmitPacket submit;
    submit.sequence = 1;
    submit.length = 8;
    submit.endpoint = BulkOutEndpoint;
    const auto packet = UsbIp::Encode(submit);
    const auto imported = [&](std::size_t size) {
        Bytes bytes = import;
        bytes.insert(bytes.end(), packet.begin(), packet.begin() + static_cast<std::ptrdiff_t>(size));
        return bytes;
    };
    struct Case {
        const char* name;
        Bytes sent;
        bool mayStay;
    };
    for (const Case& test : {
             Case{"sends nothing", {}, false},
             Case{"amid an operation", Bytes(import.begin(), import.begin() + 3), false},
             Case{"amid an import", Bytes(import.begin(), import.begin() + 8), false},
             Case{"amid a packet", imported(47), false},
             Case{"before a payload", imported(48), false},
             Case{"after an import", imported(0), true},
         }) {
        const int file = Platform::Usb::ConnectToSimulator(name_);
        ASSERT_GE(file, 0);
        const auto isOpen = [&] {
            Bytes bytes(1000);
            ssize_t count = 1;
            for (int i = 0; i < 50 && count != 0; ++i) {
                usleep(1000);
                count = recv(file, bytes.data(), bytes.size(), MSG_DONTWAIT);
            }
            return count != 0;
        };
        send(file, test.sent.data(), test.sent.size(), MSG_NOSIGNAL);
        EXPECT_TRUE(isOpen()) << test.name;
        server_.Advance(4'000'000);
        EXPECT_TRUE(isOpen()) << test.name;
        server_.Advance(2'000'000);
        EXPECT_EQ(test.mayStay, isOpen()) << test.name;
        close(file);
        server_.Advance(0);
    }
}

TEST_F(UsbIpServerTest, TcpOffersAllOfThem) {
    const std::string other = ServerThread::UniqueName("b");
    server_.Add(name_);
    server_.Add(other);
    std::uint16_t port = 0;
    server_.Do([&] { port = server_.Server().ListenTcp(0); });
    const Platform::Usb::UsbIpConnector connect = [port](Platform::ErrorCode&) {
        const int file = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
        sockaddr_in address{};
        address.sin_family = AF_INET;
        address.sin_port = htons(port);
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        EXPECT_EQ(0, ::connect(file, reinterpret_cast<sockaddr*>(&address), sizeof address));
        return file;
    };
    const auto records = Platform::Usb::ListUsbIpDevices(connect);
    ASSERT_TRUE(records);
    ASSERT_EQ(2U, records->size());
    EXPECT_EQ("1-1", (*records)[0].busId);
    EXPECT_EQ("1-2", (*records)[1].busId);
    EXPECT_EQ("/simulated/" + other, (*records)[1].path);
    EXPECT_NE((*records)[0].DeviceId(), (*records)[1].DeviceId());

    const auto overTcp = Platform::Usb::MakeUsbIpDevice(connect, "1-2");
    EXPECT_EQ(Errors::Success, overTcp->Claim());
    Do(*overTcp, TestTransfer::Vendor(Request::Reset, {31}));
    EXPECT_EQ(Errors::Busy, Open(other)->Claim()) << "one import, whichever way it came";
    EXPECT_EQ(Errors::Success, Open(name_)->Claim());
    EXPECT_EQ(Errors::DeviceNotConnected, Platform::Usb::MakeUsbIpDevice(connect, "1-3")->Claim());
}

TEST_F(UsbIpServerTest, StoppedSimulatorHoldsUpNobody) {
    const int listener = Platform::Usb::ListenAsSimulator(name_);
    ASSERT_GE(listener, 0);
    SimulatorInfo info = Describe(name_);
    EXPECT_TRUE(info.usable);
    EXPECT_FALSE(info.answers);
    for (int i = 0, file = 0; i < 1000 && file >= 0; ++i) {
        file = Platform::Usb::ConnectToSimulator(name_);
        close(file);
    }
    EXPECT_FALSE(Listed(name_)) << "it takes no more connections";
    info = Describe(name_);
    EXPECT_FALSE(info.usable);
    EXPECT_FALSE(info.answers);
    close(listener);
}

TEST_F(UsbIpServerTest, AnotherUsersSimulatorIsSeenAndNotUsed) {
    if (geteuid() != 0) {
        GTEST_SKIP() << "needs root to become somebody else";
    }
    constexpr uid_t nobody = 65534;
    int ready[2] = {-1, -1};
    ASSERT_EQ(0, pipe(ready));
    const pid_t child = fork();
    if (child == 0) {
        const bool listening = setuid(nobody) == 0 && Platform::Usb::ListenAsSimulator(name_) >= 0;
        const char answer = listening ? 'y' : 'n';
        const bool told = write(ready[1], &answer, 1) == 1;
        pause();
        _exit(told ? 0 : 1);
    }
    char answer = 'n';
    ASSERT_EQ(1, read(ready[0], &answer, 1));
    ASSERT_EQ('y', answer);
    EXPECT_FALSE(Listed(name_));
    const SimulatorInfo info = Describe(name_);
    EXPECT_FALSE(info.usable);
    EXPECT_EQ(nobody, info.userId);
    EXPECT_EQ(child, info.processId);
    Platform::ErrorCode error = Errors::Success;
    EXPECT_EQ(nullptr, SimulatorBus().Open("simulated-" + name_, error));
    EXPECT_EQ(Errors::AccessDenied, error);
    kill(child, SIGKILL);
    waitpid(child, nullptr, 0);
    close(ready[0]);
    close(ready[1]);
}

}  // namespace
}  // namespace Varnholt::Simulator
