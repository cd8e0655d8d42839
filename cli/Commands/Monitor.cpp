#include <fmt/format.h>

#include <algorithm>
#include <deque>
#include <utility>

#include "Commands/Commands.h"
#include "Commands/CommonOptions.h"
#include "ElapsedTime.h"
#include "Output/Json.h"
#include "Platform/WaitableObjects.h"

namespace Varnholt::Cli {
namespace {

struct Options {
    InstrumentOptions instrument;
    double seconds = 0;
    bool json = false;
};

/// Takes messages on the instrument's thread and hands them to the command's.
class Mailbox final : public DeviceDriver::Generic::EventListener {
  public:
    struct Message {
        std::uint32_t code;
        std::uint64_t milliseconds;  ///< on the mailbox's clock
    };

    void MessageFromDevice(std::uint32_t code, std::uint32_t) override {
        const Platform::CriticalSection::Holder holder(section_);
        waiting_.push_back({code, time_.Milliseconds()});
    }
    std::uint64_t Now() {
        const Platform::CriticalSection::Holder holder(section_);
        return time_.Milliseconds();
    }
    std::deque<Message> Take() {
        const Platform::CriticalSection::Holder holder(section_);
        return std::exchange(waiting_, {});
    }

  private:
    Platform::CriticalSection section_;  ///< guards what follows
    ElapsedTime time_;
    std::deque<Message> waiting_;
};

constexpr std::uint32_t LookInterval = 20;  // milliseconds
/// A system may list an instrument for a moment after it has gone.
constexpr int LooksForAGoneOne = 50;

/// The end of the messages looks like a removal, whatever ended them.
bool IsRemoved(Session& session, const std::string& identifier) {
    for (int look = 0; look < LooksForAGoneOne; ++look) {
        if (!IsConnected(identifier, session.UsedTransport())) {
            return true;
        }
        if (!session.UserInterruption().Sleep(LookInterval)) {
            break;
        }
    }
    return false;
}

void Monitor(Session& session, const Options& options) {
    Mailbox mailbox;
    Instrument instrument(session, options.instrument, Instrument::Choice::FirstWillDo, &mailbox);
    // There is nothing to cut off, and aborted pipes would look like an instrument that is gone.
    const Interruption::Deferral deferral(session.UserInterruption());
    const std::uint64_t start = mailbox.Now();
    session.Note("watching " + instrument.Identifier() + "; Ctrl-C ends");
    for (bool isGone = false; !isGone;) {
        for (const Mailbox::Message& message : mailbox.Take()) {
            const bool isButton = message.code == DeviceDriver::Generic::MessageButtonData;
            isGone = isGone || message.code == DeviceDriver::Generic::MessageDeviceGone;
            if (isGone && !IsRemoved(session, instrument.Identifier())) {
                throw ToolFailure(ExitCode::InputOutput,
                                  instrument.Identifier() + ": its events could not be read any more",
                                  "it is still connected: watch it again");
            }
            const double seconds = static_cast<double>(std::max(message.milliseconds, start) - start) / 1000;
            const char* const event = isButton ? "button" : isGone ? "removed" : "unknown";
            if (options.json) {
                session.Print({{"seconds", seconds}, {"event", event}, {"code", message.code}});
            } else {
                session.Out() << fmt::format("{:9.3f} s  {}\n", seconds, event);
            }
            session.FlushOut();
        }
        const auto elapsed = static_cast<double>(mailbox.Now() - start) / 1000;
        const bool isOver = options.seconds > 0 && elapsed >= options.seconds;
        if (isOver || !session.UserInterruption().Sleep(LookInterval)) {
            break;
        }
    }
}

}  // namespace

void AddMonitor(CommandSpec app, Session& session) {
    const auto options = std::make_shared<Options>();
    CommandSpec command = app.AddCommand(
        "monitor", "print a line each time that the button is pressed, and when the instrument is removed");
    command.Add("--for", options->seconds, "end after this many seconds (default: with Ctrl-C)")
        .Type("SECONDS")
        .Between(0.001, 1e6);
    AddInstrumentOptions(command, options->instrument);
    AddJsonFlag(command, options->json);
    SetAction(command, session, options, Monitor);
}

}  // namespace Varnholt::Cli
