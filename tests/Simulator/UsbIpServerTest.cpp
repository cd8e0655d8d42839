// Server and client together, over the sockets that programs use.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <sys/socket.h>

#include <future>
#include <stdexcept>

#include "Platform/Linux/ForkedProcess.h"
#include "Platform/UniqueName.h"
#include "Platform/Usb/SimulatorAddress.h"
#include "Platform/Usb/SimulatorBus.h"
#include "Platform/Usb/SystemUsbBus.h"
#include "PollLoop.h"
#include "Support/Bytes.h"
#include "Support/MeasuredBytes.h"
#include "Support/ResourceCount.h"
#include "Support/TestTransfer.h"
#include "UsbIpServer.h"

namespace Varnholt::Simulator {
namespace {

using namespace Platform::Usb;
using namespace Protocol;
using namespace Tests;
namespace UsbIp = Platform::Usb::UsbIp;

/// A server with its loop on a thread of its own, as if it were another program.
class ServerThread final {
  public:
    ServerThread() : server_(std::make_unique<UsbIpServer>(loop_, Log())) {
        if (pipe2(tasks_.data(), O_CLOEXEC) != 0) {
            std::abort();
        }
        loop_.Watch(tasks_[0], POLLIN, [this] {
            Task* task = nullptr;
            if (read(tasks_[0], &task, sizeof task) == sizeof task) {
                Task own = std::move(*task);  // whoever waits for its end destroys the other
                own();
            }
        });
        thread_ = std::thread([this] { loop_.Run(); });
    }
    ~ServerThread() {
        Do([this] {
            server_.reset();
            loop_.Stop();
        });
        thread_.join();
        close(tasks_[0]);
        close(tasks_[1]);
    }

    std::shared_ptr<SimulatedInstrument> Add(const std::string& name, const InstrumentSettings& settings = {},
                                             const std::string& faults = "") {
        std::shared_ptr<SimulatedInstrument> instrument;
        Do([&] {  // also its end, where it is refused, is the loop's
            auto made = std::make_shared<SimulatedInstrument>(loop_, settings);
            server_->Add({name, made, FaultPlan::Parse(faults), {}});
            instrument = std::move(made);
        });
        return instrument;
    }

    /// Calls `function` on the server's thread and waits for its end; passes on what it throws.
    void Do(std::function<void()> function) {
        Task task(std::move(function));
        Task* const pointer = &task;
        auto done = task.get_future();
        if (write(tasks_[1], &pointer, sizeof pointer) == sizeof pointer) {
            done.get();
        }
    }
    /// Lets the server's time jump.
    void Advance(std::uint64_t microseconds) {
        Do([&] { loop_.ahead += microseconds; });
    }

  private:
    using Task = std::packaged_task<void()>;
    struct AdvancedLoop final : PollLoop {
        std::uint64_t Now() override { return PollLoop::Now() + ahead; }
        std::uint64_t ahead = 0;
    };

    std::array<int, 2> tasks_{-1, -1};  ///< a pipe with pointers to tasks
    AdvancedLoop loop_;
    std::unique_ptr<UsbIpServer> server_;
    std::thread thread_;
};

class UsbIpServerTest : public testing::Test {
  protected:
    static std::shared_ptr<UsbDevice> Open(const std::string& name,
                                           Platform::ErrorCode expected = Errors::Success) {
        Platform::ErrorCode error = Errors::Success;
        auto device = SimulatorBus().Open("simulated-" + name, error);
        EXPECT_EQ(expected, error) << name;
        EXPECT_EQ(expected == Errors::Success, device != nullptr) << name;
        return device;
    }
    static std::shared_ptr<UsbDevice> OpenAndClaim(const std::string& name) {
        auto device = Open(name);
        EXPECT_EQ(Errors::Success, device->Claim());
        return device;
    }
    /// Two ways to ask.
    static bool Listed(const std::string& name) {
        const auto names = SimulatorBus().List();
        const bool isListed = std::ranges::count(names, "simulated-" + name) == 1;
        EXPECT_EQ(isListed, SimulatorBus().Has("simulated-" + name));
        return isListed;
    }
    static SimulatorInfo Describe(const std::string& name) {
        auto infos = ListSimulators();
        std::erase_if(infos, [&](const SimulatorInfo& info) { return info.name != "simulated-" + name; });
        EXPECT_EQ(1U, infos.size()) << name;
        return infos.empty() ? SimulatorInfo() : infos.front();
    }

    const std::string name_ = Platform::UniqueName("a");
    ServerThread server_;
};

TEST_F(UsbIpServerTest, InstrumentsAreListedByNameForAsLongAsTheyAreThere) {
    const std::string other = Platform::UniqueName("b");
    EXPECT_FALSE(Listed(name_));
    server_.Add(other);
    server_.Add(name_);
    std::vector<std::string> names = Platform::Usb::SystemUsbBus().List();
    std::erase_if(names, [](const std::string& each) { return !each.starts_with("simulated-ostra-test-"); });
    EXPECT_EQ((std::vector<std::string>{"simulated-" + name_, "simulated-" + other}), names);
    for (const std::string& refused : {name_, std::string("a/b"), std::string(), std::string(65, 'x')}) {
        EXPECT_THROW(server_.Add(refused), std::runtime_error) << refused;
    }
    server_.Add(std::string(64, 'x'));
    EXPECT_TRUE(Listed(std::string(64, 'x')));

    const auto before = TestSupport::ResourceCount::TakeSettled();
    for (int round = 0; round < 3; ++round) {
        EXPECT_TRUE(Listed(name_));
        OpenAndClaim(name_);
        const SimulatorInfo info = Describe(name_);
        EXPECT_TRUE(info.usable && info.answers);
        EXPECT_EQ(getpid(), info.processId);
        EXPECT_EQ(geteuid(), info.userId);
        for (const char* const unknown : {"nobody", "", "a/b"}) {
            Open(unknown, Errors::FileNotFound);
        }
        EXPECT_FALSE(SimulatorBus().Has(name_)) << "the prefix is a part of the name";
    }
    EXPECT_TRUE(before.Settles()) << before << " before, " << TestSupport::ResourceCount() << " after";
}

/// A megabyte does not go into a socket at once.
TEST_F(UsbIpServerTest, DataTravelBothWaysWhole) {
    constexpr std::uint32_t piece = 1U << 20U;
    const InstrumentSettings settings{.scanBytes = 3 * piece + 1000};
    const auto instrument = server_.Add(name_, settings);
    const auto device = OpenAndClaim(name_);
    Platform::ErrorCode error = Errors::Busy;
    const auto endpoints = device->Endpoints(error);
    EXPECT_EQ(Errors::Success, error);
    ASSERT_EQ(3U, endpoints.size());
    EXPECT_EQ(BulkOutEndpoint, endpoints[0].address);
    Do(*device, TestTransfer::Memory(Request::WriteEeprom, 300, 3));
    Do(*device, TestTransfer::Out(BulkOutEndpoint, {1, 2, 3}));
    Do(*device, TestTransfer::Memory(Request::ReadEeprom, 300, 3));
    EXPECT_EQ((Bytes{1, 2, 3}), Do(*device, TestTransfer::In(BulkInEndpoint, 3)));
    Do(*device, TestTransfer::Vendor(Request::Measure, {}));
    Bytes all;
    for (std::size_t before = 0; all.empty() || all.size() - before == piece;) {
        before = all.size();
        const Bytes data = Do(*device, TestTransfer::In(BulkInEndpoint, piece));
        all.insert(all.end(), data.begin(), data.end());
    }
    const auto expected = [&](Commands& state) { return Tests::MeasuredBytes(state, settings.scanBytes); };
    server_.Do([&] { EXPECT_EQ(instrument->WithCommands(expected), all); });
}

TEST_F(UsbIpServerTest, OneProgramAtATime) {
    server_.Add(name_);
    const auto first = OpenAndClaim(name_);
    const auto second = Open(name_);
    EXPECT_EQ(Errors::Busy, second->Claim());
    const std::string usedBy = Describe(name_).usedBy;
    EXPECT_NE(std::string::npos, usedBy.find("process " + std::to_string(getpid()))) << usedBy;
    EXPECT_EQ(std::string::npos, usedBy.find(Platform::Usb::UsedByMark)) << usedBy;
    first->Release();
    EXPECT_EQ(Errors::Success, second->Claim()) << "free as soon as it is released";
    second->Release();
    EXPECT_EQ("", Describe(name_).usedBy);
}

TEST_F(UsbIpServerTest, FaultsCrossTheConnection) {
    server_.Add(name_, {}, "bulk-in 0:stall; control 1:gone-before");
    for (int round = 0; round < 2; ++round) {
        const auto device = OpenAndClaim(name_);
        Do(*device, TestTransfer::In(BulkInEndpoint, 64), TransferStatus::Stalled);
        ASSERT_EQ(Errors::Success, device->ClearHalt(BulkInEndpoint));
        Do(*device, TestTransfer::Memory(Request::ReadEeprom, 4096, 64));
        EXPECT_EQ(0x01, Do(*device, TestTransfer::In(BulkInEndpoint, 64))[1]);
        Do(*device, TestTransfer::Vendor(Request::Reset, {31}), TransferStatus::DeviceGone);
    }
}

TEST_F(UsbIpServerTest, PeerThatStopsWhereItIsDueIsGivenUpAndOneThatBreaksTheProtocolIsLeft) {
    server_.Add(name_);
    const auto operation = [](UsbIp::Operation kind, std::uint16_t version = UsbIp::ProtocolVersion) {
        const auto header = UsbIp::Encode(UsbIp::OperationHeader{version, kind, {}});
        return Tests::Join(header, UsbIp::EncodeBusId(Platform::Usb::SimulatorBusId));
    };
    UsbIp::SubmitPacket submit;
    submit.length = 8;
    submit.endpoint = BulkOutEndpoint;
    const Bytes import = operation(UsbIp::Operation::ImportRequest);
    const Bytes whole = Tests::Join(import, UsbIp::Encode(submit));
    submit.in = true;
    submit.endpoint = BulkInEndpoint;
    const auto read = UsbIp::Encode(submit);
    enum After { Left, GivenUp, Served };
    for (const auto& [name, bytes, size, after] :
         std::vector<std::tuple<const char*, Bytes, std::size_t, After>>{
             {"sends nothing", whole, 0, GivenUp},
             {"amid an operation", whole, 3, GivenUp},
             {"amid an import", whole, 8, GivenUp},
             {"after an import", whole, 40, Served},
             {"amid a packet", whole, 87, GivenUp},
             {"before a payload", whole, 88, GivenUp},
             {"another version", operation(UsbIp::Operation::ImportRequest, 0x0110), 8, Left},
             {"a reply for a request", operation(UsbIp::Operation::ListReply), 8, Left},
             {"a reply for a packet", Tests::Join(import, UsbIp::Encode(UsbIp::SubmitReply{})), 88, Left},
             {"two transfers of one number", Tests::Join(import, read, read), 136, Left},
         }) {
        SCOPED_TRACE(name);
        const int file = Platform::Usb::ConnectToSimulator(name_);
        ASSERT_GE(file, 0);
        const auto isOpen = [&] {
            Bytes received(1000);
            ssize_t count = 1;
            for (int i = 0; i < 50 && count != 0; ++i) {
                usleep(1000);
                count = recv(file, received.data(), received.size(), MSG_DONTWAIT);
            }
            return count != 0;
        };
        send(file, bytes.data(), size, MSG_NOSIGNAL);
        EXPECT_EQ(after != Left, isOpen());
        server_.Advance(4'000'000);
        EXPECT_EQ(after != Left, isOpen());
        server_.Advance(2'000'000);
        EXPECT_EQ(after == Served, isOpen());
        close(file);
        server_.Advance(0);
    }
}

TEST_F(UsbIpServerTest, StoppedSimulatorHoldsUpNobody) {
    const int listener = Platform::Usb::ListenAsSimulator(name_);
    ASSERT_GE(listener, 0);
    const auto facts = [this] {
        const SimulatorInfo info = Describe(name_);
        return std::pair(info.usable, info.answers);
    };
    EXPECT_EQ(facts(), std::pair(true, false));
    const auto device = Open(name_);
    for (int i = 0, file = 0; i < 1000 && file >= 0; ++i) {
        file = Platform::Usb::ConnectToSimulator(name_);
        close(file);
    }
    EXPECT_FALSE(Listed(name_)) << "it takes no more connections";
    EXPECT_EQ(facts(), std::pair(false, false));
    close(listener);
    EXPECT_EQ(Errors::DeviceNotConnected, device->Claim()) << "it has ended";
}

TEST_F(UsbIpServerTest, AnotherUsersSimulatorIsSeenAndNotUsed) {
    if (geteuid() != 0) {
        GTEST_SKIP() << "needs root to become somebody else";
    }
    constexpr uid_t nobody = 65534;
    const Platform::ForkedProcess other([this] {
        using namespace Platform::Usb;
        const bool trusts = setuid(nobody) == 0 && IsTrustedUser(0) && IsTrustedUser(nobody);
        return trusts && ListenAsSimulator(name_) >= 0 ? pause() : 1;
    });
    const auto isThere = [this] {
        return std::ranges::count(ListSimulators(), "simulated-" + name_, &SimulatorInfo::name) == 1;
    };
    for (int look = 0; look < 10'000 && !isThere(); ++look) {
        usleep(1000);
    }
    EXPECT_FALSE(Listed(name_));
    const SimulatorInfo info = Describe(name_);
    EXPECT_FALSE(info.usable);
    EXPECT_EQ(nobody, info.userId);
    EXPECT_EQ(other.Id(), info.processId);
    Open(name_, Errors::AccessDenied);
    EXPECT_FALSE(Platform::Usb::IsTrustedUser(nobody));
}

}  // namespace
}  // namespace Varnholt::Simulator
