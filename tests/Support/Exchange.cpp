#include "Support/Exchange.h"

#include <algorithm>
#include <iterator>
#include <sstream>
#include <utility>

namespace Varnholt::Tests {

using Platform::Usb::SetupPacket;
using Platform::Usb::Transfer;
using Platform::Usb::TransferStatus;

namespace {

std::string DescribeTransfer(std::uint8_t endpoint, const SetupPacket& setup, bool isIn,
                             const std::uint8_t* data, std::uint32_t length) {
    std::ostringstream text;
    text << (isIn ? "IN  " : "OUT ") << Hex(&endpoint, 1);
    if (endpoint == 0) {
        const std::uint8_t bytes[] = {setup.requestType,
                                      setup.request,
                                      static_cast<std::uint8_t>(setup.value),
                                      static_cast<std::uint8_t>(setup.value >> 8),
                                      static_cast<std::uint8_t>(setup.index),
                                      static_cast<std::uint8_t>(setup.index >> 8),
                                      static_cast<std::uint8_t>(setup.length),
                                      static_cast<std::uint8_t>(setup.length >> 8)};
        text << " setup " << Hex(bytes, sizeof bytes);
    }
    text << " length " << length;
    if (!isIn && length > 0) {
        text << " data " << Hex(data, length);
    }
    return text.str();
}

}  // namespace

Bytes Counting(std::size_t count, unsigned first) {
    Bytes bytes(count);
    std::generate(bytes.begin(), bytes.end(), [&first] { return static_cast<std::uint8_t>(first++); });
    return bytes;
}

std::string Hex(const std::uint8_t* bytes, std::size_t count) {
    constexpr const char* Digits = "0123456789ABCDEF";
    std::string text;
    for (std::size_t i = 0; i < count; ++i) {
        text += i > 0 ? " " : "";
        text += Digits[bytes[i] >> 4];
        text += Digits[bytes[i] & 0x0F];
    }
    return text;
}

std::string Exchange::Describe() const {
    return kind == Kind::ClearHalt ? "clear halt of " + Hex(&endpoint, 1)
                                   : DescribeTransfer(endpoint, setup, IsIn(), sent.data(), length);
}

std::string Describe(const Transfer& transfer) {
    return DescribeTransfer(transfer.endpoint, transfer.setup, transfer.IsIn(), transfer.data,
                            transfer.length);
}

Exchange VendorOut(std::uint8_t request, Bytes data, std::uint16_t value, std::uint16_t index) {
    Exchange row;
    row.length = static_cast<std::uint32_t>(data.size());
    row.moved = row.length;
    row.setup = {Protocol::VendorOut, request, value, index, static_cast<std::uint16_t>(data.size())};
    row.sent = std::move(data);
    return row;
}

Exchange VendorIn(std::uint8_t request, std::uint16_t length, Bytes answer, std::uint16_t value,
                  std::uint16_t index) {
    Exchange row = BulkIn(length, std::move(answer), 0);
    row.setup = {Protocol::VendorIn, request, value, index, length};
    return row;
}

Exchange BulkOut(Bytes data, std::uint8_t endpoint) {
    Exchange row;
    row.endpoint = endpoint;
    row.length = static_cast<std::uint32_t>(data.size());
    row.moved = row.length;
    row.sent = std::move(data);
    return row;
}

Exchange BulkIn(std::uint32_t length, Bytes answer, std::uint8_t endpoint) {
    Exchange row;
    row.endpoint = endpoint;
    row.length = length;
    row.status = answer.size() > length ? TransferStatus::Overflow : TransferStatus::Completed;
    row.moved = std::min(length, static_cast<std::uint32_t>(answer.size()));
    row.received = std::move(answer);
    return row;
}

Exchange HaltCleared(std::uint8_t endpoint) {
    Exchange row;
    row.kind = Exchange::Kind::ClearHalt;
    row.endpoint = endpoint;
    return row;
}

}  // namespace Varnholt::Tests
