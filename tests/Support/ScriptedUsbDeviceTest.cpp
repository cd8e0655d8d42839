#include <gtest/gtest-spi.h>
#include <gtest/gtest.h>

#include <optional>

#include "Support/ScriptedUsbDevice.h"

namespace Varnholt::Tests {
namespace {

using Platform::Usb::Transfer;
using Platform::Usb::TransferStatus;

struct Client final : Platform::Usb::TransferClient {
    void TransferCompleted(Transfer&) noexcept override { ++completions; }
    int completions = 0;
};

/// Submits what `row` describes.
TransferStatus Submit(ScriptedUsbDevice& device, Exchange row) {
    Client client;
    Bytes buffer = row.sent;
    buffer.resize(row.length);
    Transfer transfer;
    transfer.endpoint = row.endpoint;
    transfer.setup = row.setup;
    transfer.data = buffer.data();
    transfer.length = row.length;
    transfer.client = &client;
    EXPECT_EQ(device.Submit(transfer), Platform::Errors::Success);
    EXPECT_EQ(client.completions, 1);
    return transfer.status;
}

// A transcript that compared less would let a wrong wire format pass.
TEST(ScriptedUsbDevice, TellsEveryDifferenceApart) {
    const struct {
        const char* name;
        Exchange expected;
        std::optional<Exchange> actual;
        const char* message;
    } cases[] = {
        {"request", VendorOut(0xC0, {1}), VendorOut(0xC1, {1}),
         "expected: OUT 00 setup 40 C0 00 00 00 00 01 00 length 1 data 01\n"
         "  actual:   OUT 00 setup 40 C1 00 00 00 00 01 00 length 1 data 01"},
        {"value", VendorOut(0xC0, {}, 0x1234), VendorOut(0xC0, {}, 0x1235),
         "actual:   OUT 00 setup 40 C0 35 12"},
        {"index", VendorOut(0xC0, {}, 0, 1), VendorOut(0xC0, {}, 0, 2), "40 C0 00 00 02 00 00 00"},
        {"direction", VendorOut(0xC0, {}), VendorIn(0xC0, 0, {}), "actual:   IN  00 setup C0"},
        {"sent data", BulkOut({1, 2, 3}), BulkOut({1, 2, 4}), "data 01 02 04"},
        {"more data", BulkOut({1, 2}), BulkOut({1, 2, 3}), "length 3 data 01 02 03"},
        {"less data", BulkOut({1, 2}), BulkOut({1}), "length 1 data 01"},
        {"length asked for", BulkIn(64, {}), BulkIn(128, {}), "IN  82 length 128"},
        {"endpoint", BulkIn(8, {}, 0x82), BulkIn(8, {}, 0x84), "IN  84 length 8"},
        {"a transfer where a halt ought to be cleared", HaltCleared(0x82), BulkIn(8, {}), "clear halt of 82"},
        {"nothing where a transfer is expected", BulkIn(8, {}), std::nullopt,
         "1 rows of the script were not"},
    };
    for (const auto& row : cases) {
        SCOPED_TRACE(row.name);
        ScriptedUsbDevice device({row.expected});
        if (row.actual) {
            EXPECT_NONFATAL_FAILURE(EXPECT_EQ(Submit(device, *row.actual), TransferStatus::Stalled),
                                    row.message);
        } else {
            EXPECT_NONFATAL_FAILURE(device.ExpectFinished(), row.message);
        }
    }
    ScriptedUsbDevice device;
    EXPECT_NONFATAL_FAILURE(Submit(device, BulkOut({7})), "expected: nothing more");
    EXPECT_EQ(Submit(device, BulkOut({7})), TransferStatus::Stalled) << "one difference is told once";
}

TEST(ScriptedUsbDevice, WantsHaltsCleared) {
    ScriptedUsbDevice device({BulkIn(8, {}).Ends(TransferStatus::Stalled), BulkIn(8, {})});
    EXPECT_EQ(Submit(device, BulkIn(8, {})), TransferStatus::Stalled);
    EXPECT_NONFATAL_FAILURE(Submit(device, BulkIn(8, {})), "an endpoint is halted");
}

}  // namespace
}  // namespace Varnholt::Tests
