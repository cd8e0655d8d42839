#include "Service/ScanRun.h"

#include <fmt/format.h>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"

namespace Varnholt::Service {
namespace {

using Commands = OpenedInstrument::Commands;

/// An instrument whose scan was cut off would go on streaming.
void EndStream(OpenedInstrument& instrument) {
    instrument.UsedContext().Resume();
    try {
        instrument.Reset(Protocol::OpeningResetCode);
    } catch (...) {  // what ended the scan is what counts, and the next opening resets the instrument
    }
}

/// Whether a transfer brought less than it should.
bool IsShortfall(const std::exception_ptr& failure) {
    try {
        std::rethrow_exception(failure);
    } catch (const DeviceDriver::Generic::Utilities::DeviceDriverException& exception) {
        return exception.MissingData().has_value();
    } catch (...) {
        return false;
    }
}

/// To the end of the scan, or until less comes than should.
void Stream(OpenedInstrument& instrument, const ScanSettings& settings, ScanRecorder& recorder,
            const ScanReport& report) {
    std::exception_ptr failure;
    instrument.Do([&](const Commands& commands) {
        commands->SetScanReceiver(&recorder);
        try {
            commands->StartScan(settings.recordSize, settings.timeout, settings.total);
        } catch (...) {
            failure = recorder.Failure() != nullptr ? recorder.Failure() : std::current_exception();
        }
        commands->SetScanReceiver(nullptr);
    });
    // A transfer that was aborted can look like one with which the instrument has stopped.
    const bool isComplete = failure == nullptr && settings.total > 0 && report.received == settings.total;
    if (instrument.UsedContext().UserInterruption().IsRequested() && !isComplete) {
        EndStream(instrument);
        throw Failure(FailureKind::Interrupted, "scan interrupted").Of(instrument.Identifier());
    }
    if (recorder.Failure() != nullptr) {
        EndStream(instrument);
    }
    // A transfer that brought less than it should is told as what is missing of the whole scan.
    if (failure != nullptr && !(settings.total > 0 && IsShortfall(failure))) {
        throw instrument.UsedContext().Explain(failure, instrument.Identifier());
    }
}

}  // namespace

void RunScan(OpenedInstrument& instrument, const ScanSettings& settings, const RecordSink& sink,
             ScanReport& report) {
    const auto progress = instrument.UsedContext().Told().StartProgress("scanning", settings.total, "B");
    report = {};
    ScanRecorder recorder(settings.recordSize, sink, report, *progress);
    Stream(instrument, settings, recorder, report);
    report.hasStoppedEarly = report.received < settings.total;
    if (report.hasStoppedEarly) {
        throw Failure(
            FailureKind::ShortData,
            fmt::format("the instrument stopped: {} of {} bytes came", report.received, settings.total),
            "a smaller --total, or none: then the scan is as long as the instrument makes it")
            .Of(instrument.Identifier());
    }
}

}  // namespace Varnholt::Service
