#pragma once

#include "Platform/DeviceFiles.h"
#include "Platform/Drivers/DriverFileSystem.h"
#include "Platform/TestThread.h"
#include "Protocol/ByteOrder.h"
#include "Protocol/NativeDriver.h"
#include "Protocol/UsbIoDriver.h"
#include "Support/HookedUsb.h"

namespace Varnholt::Tests {

namespace Errors = Platform::Errors;
namespace Native = Protocol::NativeDriver;

inline constexpr std::uint8_t In = Protocol::BulkInEndpoint;

/// How a request ended.
struct Outcome {
    Platform::ErrorCode code;
    std::uint32_t bytes;
    bool operator==(const Outcome&) const = default;
};
inline void PrintTo(const Outcome& outcome, std::ostream* out) {
    *out << "code " << outcome.code << " (0x" << std::hex << outcome.code << std::dec << "), "
         << outcome.bytes << " bytes";
}

/// A record with an event of its own. A test closes the file before it lets go of a record that still runs.
struct Request {
    Platform::OwnedHandle event{Platform::MakeAutoResetEvent()};
    Platform::Overlapped record;

    Request() { record.event = event.Get(); }
    bool TakeSignal() { return Platform::Wait(event.Get(), 0) == Platform::WaitResult::Signalled; }
};

/// The blocks of both drivers as hosts lay them out; reserved and padding bytes of the first do not matter.
inline Bytes NativeBlock(std::uint8_t request, std::uint8_t direction, std::uint16_t value = 0,
                         std::uint16_t index = 0, std::uint8_t type = 2, std::uint8_t recipient = 0) {
    Bytes block{direction, type, recipient, 0xEE, request, 0xEE, 0, 0, 0, 0};
    Protocol::StoreLittle16(&block[6], value);
    Protocol::StoreLittle16(&block[8], index);
    return block;
}

inline Bytes ConfigurationBlock(std::uint8_t configuration = 0, std::uint8_t entries = 1,
                                std::uint8_t interface = 0, std::uint8_t alternate = 0,
                                std::uint32_t most = 65536) {
    Bytes block{configuration, 0, entries, 0, interface, 0, alternate, 0};
    block.resize(260);
    Protocol::StoreLittle32(&block[8], most);
    return block;
}

inline Bytes RequestBlock(std::uint8_t request, std::uint16_t value = 0, std::uint16_t index = 0,
                          std::uint8_t type = 2, std::uint8_t recipient = 0, std::uint8_t reserved = 0) {
    Bytes block(18);
    block[4] = type;
    block[8] = recipient;
    block[12] = reserved;
    block[13] = request;
    Protocol::StoreLittle16(&block[14], value);
    Protocol::StoreLittle16(&block[16], index);
    return block;
}

/// Both drivers over one device, "port1".
class DriverFixture : public testing::Test {
  protected:
    DriverFixture() { bus_.devices = {{"port1", device_}}; }

    Platform::Handle Open(const std::string& path) {
        const Platform::Handle handle = files_->Open(path);
        EXPECT_NE(handle, Platform::InvalidHandle()) << path << ": error " << Platform::LastError();
        return handle;
    }
    Platform::ErrorCode OpenError(const std::string& path) {
        const Platform::Handle handle = files_->Open(path);
        return Platform::ErrorOf(handle != Platform::InvalidHandle() && files_->CloseFile(handle));
    }
    Platform::Handle OpenPipe(std::uint32_t number) {
        return Open("native/port1\\PIPE0" + std::to_string(number));
    }
    /// A file of the USBIO driver, configured and bound.
    Platform::Handle OpenBound(std::uint8_t endpoint) {
        namespace Code = Protocol::UsbIoDriver::Control;
        const Platform::Handle handle = Open("usbio/port1");
        Control(handle, Code::SetConfiguration, ConfigurationBlock());
        EXPECT_EQ(Control(handle, Code::BindPipe, {endpoint}).code, 0u);
        return handle;
    }

    Outcome Control(Platform::Handle file, std::uint32_t code, const Bytes& input = {}) {
        Bytes output;
        return Control(file, code, input, output);
    }
    Outcome Control(Platform::Handle file, std::uint32_t code, const Bytes& input, Bytes& output) {
        Request request;
        return Finish(file, request,
                      files_->Start(file,
                                    Platform::Operation::Control(code, input, output.data(),
                                                                 static_cast<std::uint32_t>(output.size())),
                                    request.record));
    }
    Outcome Read(Platform::Handle file, Bytes& buffer) {
        Request request;
        return Finish(file, request, StartRead(file, buffer, request));
    }
    Outcome Write(Platform::Handle file, const Bytes& data) {
        Request request;
        return Finish(
            file, request,
            files_->Start(file,
                          Platform::Operation::Write(data.data(), static_cast<std::uint32_t>(data.size())),
                          request.record));
    }
    bool StartRead(Platform::Handle file, Bytes& buffer, Request& request) {
        return files_->Start(
            file, Platform::Operation::Read(buffer.data(), static_cast<std::uint32_t>(buffer.size())),
            request.record);
    }
    /// Starts a read that must stay pending.
    void StartPending(Platform::Handle file, Bytes& buffer, Request& request) {
        EXPECT_EQ(Platform::ErrorOf(StartRead(file, buffer, request)), Platform::Errors::IoPending);
    }
    Outcome Result(Platform::Handle file, Request& request, bool wait = false) {
        std::uint32_t bytes = 0xDEAD;
        const bool succeeded = files_->GetResult(file, request.record, bytes, wait);
        return {Platform::ErrorOf(succeeded), bytes};
    }

    HookedBus bus_;
    const std::shared_ptr<HookedDevice> device_ = std::make_shared<HookedDevice>();
    std::unique_ptr<Platform::DeviceFileSystem> files_ = Platform::Drivers::MakeDriverFileSystem(bus_);

  private:
    Outcome Finish(Platform::Handle file, Request& request, bool atOnce) {
        if (!atOnce && Platform::LastError() != Platform::Errors::IoPending) {
            const Platform::ErrorCode code = Platform::LastError();
            EXPECT_FALSE(request.TakeSignal()) << "signalled without a transfer";
            EXPECT_EQ(Result(file, request), (Outcome{code, 0})) << "the record does not tell of the failure";
            return {code, 0};
        }
        const Outcome outcome = Result(file, request, true);
        EXPECT_TRUE(request.TakeSignal()) << "not signalled";
        return outcome;
    }
};

}  // namespace Varnholt::Tests
