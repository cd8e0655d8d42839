#pragma once

#include <pybind11/numpy.h>
#include <pybind11/pybind11.h>

#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "Away.h"
#include "Host.h"
#include "InterruptGuard.h"
#include "Service/EventWatch.h"
#include "Service/Measurement.h"
#include "Service/OpenedInstrument.h"

namespace Varnholt::Python {

namespace py = pybind11;

class EventStream;
class ScanStream;

/// Ends an object where instruments can be used. In a forked process, and beside the thread of a virtual
/// clock, it stays as it is: its threads and locks are not this thread's to wait for.
struct EndWhereUsable {
    template <class Object>
    void operator()(Object* object) const {
        if (Host::Instance().IsUsable()) {
            delete object;
        }
    }
};
template <class Object, class... Arguments>
std::shared_ptr<Object> Make(Arguments&&... arguments) {
    return std::shared_ptr<Object>(new Object(std::forward<Arguments>(arguments)...), EndWhereUsable());
}

/// One opened instrument. Called with the interpreter's lock held, which is given up while the instrument
/// works; several threads take turns.
class Instrument final : public std::enable_shared_from_this<Instrument> {
  public:
    using Transport = Service::Context::Transport;

    Instrument(const std::string& identifier, Transport transport);
    ~Instrument();
    Instrument(const Instrument&) = delete;
    Instrument& operator=(const Instrument&) = delete;

    const std::string& Identifier() const { return identifier_; }
    bool IsOpen() const { return !closing_; }
    /// Ends what runs on other threads. Harmless twice.
    void Close();

    /// Sets what readouts and scans are taken with; waits for what is left of the second after the reset.
    void Prepare(const Service::MeasurementSettings& settings);
    Service::MeasurementFacts Facts(const Service::MeasurementSettings& settings);
    /// Seconds and milliseconds of its beginning, and 128 values.
    py::tuple Readout();

    /// What `work` answers when it is given the opened instrument, which nobody else uses meanwhile. After a
    /// Ctrl-C the instrument is reset, and KeyboardInterrupt raised.
    template <class Work>
    auto Use(Work work) {
        const Turn turn(*this);
        try {
            const InterruptGuard guard(interruption_);
            const Away away;
            return work(*opened_);
        } catch (const Service::Failure& failure) {
            if (failure.Kind() != Service::FailureKind::Interrupted) {
                throw;
            }
        }
        RecoverAndRaise();
    }

    std::shared_ptr<EventStream> Events();
    std::shared_ptr<ScanStream> Scan(std::uint32_t recordSize, std::uint32_t total, std::uint32_t timeout,
                                     bool asBytes);
    void StopScan();
    /// How often the instrument was reset behind the caller's back: what was prepared is gone then.
    int Resets() const { return resets_; }

  private:
    friend class EventStream;
    friend class ScanStream;

    /// The instrument is the calling thread's until the end of the object.
    class Turn final {
      public:
        explicit Turn(Instrument& instrument, bool withScan = false);

      private:
        std::unique_lock<std::timed_mutex> lock_;
    };

    [[noreturn]] void RecoverAndRaise();
    /// After the end of a scan, on whatever thread has waited for that.
    void ScanEnded(bool wasReset);

    const std::string identifier_;
    std::optional<Host::Use> use_;  ///< until it is closed
    Service::Observer observer_;
    Service::Interruption interruption_;
    Service::Context context_;
    Service::EventMailbox mailbox_;
    std::timed_mutex mutex_;  // held by the thread whose turn it is; guards what follows
    std::optional<Service::OpenedInstrument> opened_;
    std::weak_ptr<ScanStream> scan_;
    std::vector<std::weak_ptr<EventStream>> events_;
    std::atomic<std::uint32_t> openedAt_{0};  ///< or reset; ticks
    std::atomic<int> resets_{0};
    std::atomic<bool> closing_{false};
};

/// What an instrument reports of its own accord, from the object's making on.
class EventStream final {
  public:
    explicit EventStream(std::shared_ptr<Instrument> instrument);
    EventStream(const EventStream&) = delete;
    EventStream& operator=(const EventStream&) = delete;

    /// The next event as (kind, code, seconds); None after `timeout` seconds (negative: any time), and when
    /// the instrument is closed.
    py::object Next(double timeout);
    bool IsOpen();

  private:
    friend class Instrument;
    std::atomic<bool> mustEnd_{
        false};         // said before the reader is taken: who waits for events locks again and again
    std::mutex mutex_;  // guards the reader
    std::optional<Service::EventReader> reader_;
};

}  // namespace Varnholt::Python
