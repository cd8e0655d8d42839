#pragma once

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <deque>
#include <string>
#include <vector>

#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionalityByte.h"

namespace Varnholt::Tests {

/// A transport that writes down every call as a line of text ("WriteEEPROM 00001000 0100 data=256") and
/// answers from a queue of byte strings, zeros where the queue is empty.
class RecordingTransport final : public DeviceDriver::Ostra::LowLevel::PellandoFunctionalityByte {
  public:
    using Bytes2 = DeviceDriver::Ostra::LowLevel::Bytes2;
    using Bytes4 = DeviceDriver::Ostra::LowLevel::Bytes4;

    struct Log {
        std::vector<std::string> calls;
        std::vector<std::vector<std::uint8_t>> written;
        std::deque<std::vector<std::uint8_t>> answers;
    };
    explicit RecordingTransport(Log& callLog) : log(callLog) {}

    void RemoveListener(DeviceDriver::Generic::EventListener* listener) override {
        Note(listener ? "RemoveListener one" : "RemoveListener null");
    }
    void StartScan(std::uint32_t recordSize, std::uint32_t seconds, std::uint32_t total) override {
        Note("StartScan " + std::to_string(recordSize) + " " + std::to_string(seconds) + " " +
             std::to_string(total));
    }
    void GetScanData(std::uint8_t* buffer, std::uint32_t* size) override {
        Note("GetScanData " + std::to_string(*size));
        if (log.answers.empty()) {
            *size = 0;
            return;
        }
        std::ranges::copy(Answer(*size), buffer);
    }
    void MeasureRequest(std::uint8_t* buffer, std::uint32_t length, std::uint32_t seconds) override {
        Note("MeasureRequest " + std::to_string(length) + " " + std::to_string(seconds));
        std::ranges::copy(Answer(length), buffer);
    }
    void SetMeasureParameters(const Bytes2& p1, const Bytes2& p2, const Bytes2& p3,
                              std::uint8_t p4) override {
        Note("SetMeasureParameters " + Hex(p1) + " " + Hex(p2) + " " + Hex(p3) + " " + std::to_string(p4));
    }
    void GetMeasureParameters(Bytes2& p1, Bytes2& p2, Bytes2& p3, std::uint8_t& p4,
                              std::uint8_t& p5) override {
        Note("GetMeasureParameters");
        const auto a = Answer(8);
        p1 = {a[0], a[1]}, p2 = {a[2], a[3]}, p3 = {a[4], a[5]}, p4 = a[6], p5 = a[7];
    }
    void SetMeasureMode(std::uint8_t mode) override { Note("SetMeasureMode " + std::to_string(mode)); }
    void GetMeasureMode(std::uint8_t& m1, std::uint8_t& m2, std::uint8_t& m3, std::uint8_t& m4,
                        std::uint8_t& m5, std::uint8_t& m6) override {
        Note("GetMeasureMode");
        const auto a = Answer(6);
        m1 = a[0], m2 = a[1], m3 = a[2], m4 = a[3], m5 = a[4], m6 = a[5];
    }
    void WriteEEPROM(const Bytes4& address, const Bytes2& length, const std::uint8_t* data,
                     std::uint32_t count) override {
        Note("WriteEEPROM " + Hex(address) + " " + Hex(length) + " data=" + std::to_string(count));
        log.written.emplace_back(data, data + count);
    }
    void ReadEEPROM(const Bytes4& address, const Bytes2& length, std::uint8_t* data,
                    std::uint32_t count) override {
        Note("ReadEEPROM " + Hex(address) + " " + Hex(length) + " data=" + std::to_string(count));
        std::ranges::copy(Answer(count), data);
    }
    void WriteCPLD(const Bytes2& c1, const Bytes2& c2, const Bytes2& c3) override {
        Note("WriteCPLD " + Hex(c1) + " " + Hex(c2) + " " + Hex(c3));
    }
    void ReadCPLD(Bytes2& value) override {
        Note("ReadCPLD");
        const auto a = Answer(2);
        value = {a[0], a[1]};
    }
    void DownloadRAMFirmware(std::uint16_t address, const std::uint8_t* image, std::uint32_t count) override {
        Note("DownloadRAMFirmware " + std::to_string(address) + " data=" + std::to_string(count));
        log.written.emplace_back(image, image + count);
    }
    void DownloadEEPROMFirmware(const Bytes4& address, const Bytes2& length, const std::uint8_t* image,
                                std::uint32_t count) override {
        Note("DownloadEEPROMFirmware " + Hex(address) + " " + Hex(length) + " data=" + std::to_string(count));
        log.written.emplace_back(image, image + count);
    }
    void GetMISC(std::uint8_t& m1, Bytes2& m2, std::uint8_t& m3, Bytes2& m4, Bytes2& m5) override {
        Note("GetMISC");
        const auto a = Answer(8);
        m2 = {a[0], a[1]}, m4 = {a[2], a[3]}, m5 = {a[4], a[5]}, m1 = a[6], m3 = a[7];
    }
    void GetChipID(std::uint8_t* id) override {
        Note("GetChipID");
        std::ranges::copy(Answer(8), id);
    }
    void Reset(const Bytes2& code) override { Note("Reset " + Hex(code)); }
    void GetDeviceIdentifier(std::string& identifier) override { identifier = "recording"; }

  private:
    template <std::size_t N>
    static std::string Hex(const std::array<std::uint8_t, N>& bytes) {
        std::string text;
        for (const std::uint8_t byte : bytes) {
            text += "0123456789ABCDEF"[byte >> 4];
            text += "0123456789ABCDEF"[byte & 0xF];
        }
        return text;
    }
    void Note(const std::string& call) { log.calls.push_back(call); }
    std::vector<std::uint8_t> Answer(std::size_t size) {
        std::vector<std::uint8_t> answer;
        if (!log.answers.empty()) {
            answer = log.answers.front();
            log.answers.pop_front();
        }
        answer.resize(size);
        return answer;
    }

    Log& log;
};

}  // namespace Varnholt::Tests
