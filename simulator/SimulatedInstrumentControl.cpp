// Endpoint 0 of the simulated instrument.
#include <algorithm>
#include <array>

#include "Completions.h"
#include "Descriptors.h"
#include "SimulatedInstrument.h"

namespace Varnholt::Simulator {

using Platform::Usb::SetupPacket;
using Platform::Usb::Transfer;
using Platform::Usb::TransferStatus;

namespace {

constexpr std::uint8_t RecipientMask = 0x1F;
constexpr std::uint8_t ToDevice = 0;
constexpr std::uint8_t ToInterface = 1;
constexpr std::uint8_t ToEndpoint = 2;
constexpr std::uint16_t EndpointHalt = 0;

enum StandardRequest : std::uint8_t {
    GetStatus = 0,
    ClearFeature = 1,
    SetFeature = 3,
    SetAddress = 5,
    GetDescriptor = 6,
    GetConfiguration = 8,
    SetConfiguration = 9,
    GetInterface = 10,
    SetInterface = 11,
};

}  // namespace

void SimulatedInstrument::Control(Transfer& transfer, std::uint64_t now, Completions& done) {
    const SetupPacket& setup = transfer.setup;
    const std::uint32_t length = std::min<std::uint32_t>(transfer.length, setup.length);
    const bool standard = setup.IsStandard();
    const std::uint8_t vendorType = setup.IsIn() ? Protocol::VendorIn : Protocol::VendorOut;

    if (!setup.IsIn()) {
        bool accepted = false;
        if (standard) {
            accepted = StandardOut(setup, done);
        } else if (setup.requestType == vendorType) {
            accepted = commands_.Out(setup, {transfer.data, length});
        }
        if (accepted && !standard) {
            const bool exposes = settings_.takesIntegrationTime &&
                                 setup.request == static_cast<std::uint8_t>(Protocol::Request::Measure);
            const Exposure exposure = commands_.NextExposure();
            constexpr std::uint64_t nanosecondsPerMicrosecond = 1000;
            answersFrom_ =
                now + (exposes ? exposure.microseconds * exposure.averages * nanosecondsPerMicrosecond : 0);
        }
        done.Add(transfer, accepted ? TransferStatus::Completed : TransferStatus::Stalled,
                 accepted ? length : 0);
        return;
    }

    std::vector<std::uint8_t> standardAnswer;
    std::array<std::uint8_t, Commands::LongestAnswer> vendorAnswer{};
    std::span<const std::uint8_t> answer;
    if (standard) {
        standardAnswer = StandardIn(setup);
        answer = standardAnswer;
    } else if (setup.requestType == vendorType) {
        answer = std::span(vendorAnswer).first(commands_.In(setup, vendorAnswer).value_or(0));
    }
    if (answer.empty()) {
        done.Add(transfer, TransferStatus::Stalled, 0);
        return;
    }
    const auto moved = static_cast<std::uint32_t>(std::min<std::size_t>(length, answer.size()));
    std::copy_n(answer.begin(), moved, transfer.data);
    done.Add(transfer, TransferStatus::Completed, moved);
}

bool SimulatedInstrument::StandardOut(const SetupPacket& setup, Completions& done) {
    Endpoint* const endpoint = (setup.requestType & RecipientMask) == ToEndpoint
                                   ? FindEndpoint(static_cast<std::uint8_t>(setup.index))
                                   : nullptr;
    switch (setup.request) {
        case SetAddress:
            return true;
        case SetConfiguration:
            if (setup.value > ConfigurationValue) {
                return false;
            }
            configuration_ = static_cast<std::uint8_t>(setup.value);
            for (Endpoint& each : endpoints_) {
                each.halted = false;
            }
            return true;
        case SetInterface:
            return setup.value == 0 && setup.index == 0;
        case ClearFeature:
            if (!endpoint || setup.value != EndpointHalt) {
                return false;
            }
            endpoint->halted = false;
            return true;
        case SetFeature:
            if (!endpoint || setup.value != EndpointHalt) {
                return false;
            }
            Halt(*endpoint, done);
            return true;
        default:
            return false;
    }
}

std::vector<std::uint8_t> SimulatedInstrument::StandardIn(const SetupPacket& setup) {
    const std::uint8_t recipient = setup.requestType & RecipientMask;
    switch (setup.request) {
        case GetDescriptor:
            return Descriptor(setup.value, settings_.serial);
        case GetStatus:
            if (recipient == ToDevice) {
                constexpr std::uint8_t selfPowered = 1;
                return {selfPowered, 0};
            }
            if (recipient == ToInterface || setup.index == 0) {
                return {0, 0};
            }
            if (const Endpoint* const endpoint = FindEndpoint(static_cast<std::uint8_t>(setup.index))) {
                return {static_cast<std::uint8_t>(endpoint->halted ? 1 : 0), 0};
            }
            return {};
        case GetConfiguration:
            return {configuration_};
        case GetInterface:
            return {0};
        default:
            return {};
    }
}

}  // namespace Varnholt::Simulator
