#include "Instrument.h"

#include <algorithm>
#include <chrono>

#include "Platform/Time.h"
#include "ScanStream.h"
#include "Service/Instruments.h"

namespace Varnholt::Python {

using Service::Failure;
using Service::FailureKind;

namespace {

constexpr std::chrono::milliseconds LookForSignals{50};

Failure Closed(const std::string& identifier) {
    return Failure(FailureKind::Other, "the instrument is closed", "open it again").Of(identifier);
}

}  // namespace

Instrument::Turn::Turn(Instrument& instrument, bool withScan) : lock_(instrument.mutex_, std::defer_lock) {
    Host::Instance().CheckUsable();
    while (!lock_.try_lock()) {
        {
            const Away away;
            if (lock_.try_lock_for(LookForSignals)) {
                break;
            }
        }
        CheckSignals();
    }
    if (instrument.closing_) {
        throw Closed(instrument.identifier_);
    }
    if (const auto scan = instrument.scan_.lock(); !withScan && scan && scan->IsRunning()) {
        throw Failure(FailureKind::InUse, "a scan is running", "take it to its end, or call stop_scan()")
            .Of(instrument.identifier_);
    }
}

Instrument::Instrument(const std::string& identifier, Transport transport)
    : identifier_(identifier),
      use_(std::in_place),
      context_(observer_, interruption_, Host::Instance().Files(), identifier) {
    Host::Instance().CheckUsable();
    context_.ChooseTransport(transport);
    std::optional<Failure> interrupted;
    {
        const InterruptGuard guard(interruption_);
        const Away away;
        try {
            opened_.emplace(context_, FindInstrument(context_, identifier), &mailbox_);
            openedAt_ = Platform::TickCount();
            return;
        } catch (const Failure& failure) {
            if (failure.Kind() != FailureKind::Interrupted) {
                throw;
            }
        }
    }
    RaiseInterrupt();
}

Instrument::~Instrument() {
    Close();
}

void Instrument::Close() {
    if (Host::Instance().IsForked()) {
        return;  // it is the other process's
    }
    Host::Instance().CheckUsable();
    if (closing_.exchange(true)) {
        return;
    }
    const AwayIfHere away;
    if (const auto scan = scan_.lock()) {
        scan->Close();
    }
    std::unique_lock lock(mutex_, std::try_to_lock);
    if (!lock) {
        interruption_.Request();
        lock.lock();
    }
    for (const auto& weak : events_) {
        if (const auto stream = weak.lock()) {
            stream->mustEnd_ = true;
            const std::lock_guard held(stream->mutex_);
            stream->reader_.reset();
        }
    }
    opened_.reset();
    use_.reset();
}

void Instrument::RecoverAndRaise() {
    if (closing_) {
        throw Closed(identifier_);
    }
    {
        const Away away;
        // What the instrument was about to send would be taken for the answer to the next command.
        context_.Resume();
        interruption_.Withdraw();
        try {
            opened_->Reset(Protocol::OpeningResetCode);
        } catch (const Failure&) {  // the next command tells
        }
        openedAt_ = Platform::TickCount();
        ++resets_;
    }
    RaiseInterrupt();
}

void Instrument::ScanEnded(bool wasReset) {
    context_.Resume();
    interruption_.Withdraw();
    if (wasReset) {
        openedAt_ = Platform::TickCount();
        ++resets_;
    }
}

void Instrument::Prepare(const Service::MeasurementSettings& settings) {
    Use([&](Service::OpenedInstrument& opened) {
        const std::uint32_t passed = Platform::TickCount() - openedAt_;
        if (passed < Interface::FixedReadout::WaitAfterOpening) {
            context_.Sleep(Interface::FixedReadout::WaitAfterOpening - passed);
        }
        SetMeasurement(opened, settings);
    });
}

Service::MeasurementFacts Instrument::Facts(const Service::MeasurementSettings& settings) {
    return Use([&](Service::OpenedInstrument& opened) { return FactsOf(opened, settings); });
}

py::tuple Instrument::Readout() {
    const Service::RawReadout raw = Use(Service::TakeReadout);
    const auto values = raw.Values();
    return py::make_tuple(raw.time.seconds, raw.time.milliseconds,
                          py::array_t<std::int32_t>(static_cast<py::ssize_t>(values.size()), values.data()));
}

std::shared_ptr<EventStream> Instrument::Events() {
    const Turn turn(*this, true);
    auto stream = Make<EventStream>(shared_from_this());
    std::erase_if(events_, [](const auto& weak) { return weak.expired(); });
    events_.push_back(stream);
    return stream;
}

std::shared_ptr<ScanStream> Instrument::Scan(std::uint32_t recordSize, std::uint32_t total,
                                             std::uint32_t timeout, bool asBytes) {
    const Turn turn(*this);
    auto scan =
        Make<ScanStream>(shared_from_this(), Service::ScanSettings{recordSize, total, timeout}, asBytes);
    scan_ = scan;
    return scan;
}

void Instrument::StopScan() {
    if (const auto scan = scan_.lock()) {
        scan->Close();
    }
}

EventStream::EventStream(std::shared_ptr<Instrument> instrument) {
    reader_.emplace(instrument->mailbox_, *instrument->opened_);
}

bool EventStream::IsOpen() {
    const Away away;
    const std::lock_guard held(mutex_);
    return reader_.has_value();
}

py::object EventStream::Next(double timeout) {
    Host::Instance().CheckUsable();
    const double slice = static_cast<double>(LookForSignals.count()) / 1e3;
    std::optional<Service::InstrumentEvent> event;
    double end = -1;
    while (!mustEnd_) {
        {
            const Away away;
            const std::lock_guard held(mutex_);
            if (!reader_) {
                break;
            }
            event = reader_->Next();
            const double now = reader_->Seconds();
            end = end < 0 ? now + timeout : end;
            const double left = timeout < 0 ? slice : std::min(slice, end - now);
            if (event || left <= 0) {
                break;
            }
            reader_->Wait(static_cast<std::uint32_t>(std::max(1.0, left * 1e3)));
        }
        CheckSignals();
    }
    if (!event) {
        return py::none();
    }
    return py::make_tuple(event->kind == Service::EventKind::Button    ? "button"
                          : event->kind == Service::EventKind::Removed ? "removed"
                                                                       : "unknown",
                          event->code, event->seconds);
}

}  // namespace Varnholt::Python
