#include "DeviceDriver/Ostra/LowLevel/Win32/InterruptListener.h"

#include <utility>
#include <vector>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Ostra/LowLevel/InterruptWatch.h"
#include "DeviceDriver/Ostra/LowLevel/Win32/USBConnection.h"
#include "Utilities/Exceptions/Trace.h"
#include "Utilities/Multithreading/ScopedLock.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

using Generic::EventListener;
using Varnholt::Utilities::Multithreading::ScopedLock;

namespace {
constexpr std::size_t ReceiveBufferSize = 8;
}

/// Opens the pipe itself, and closes it at its end.
class InterruptListener::Watch final : public InterruptWatch {
  public:
    explicit Watch(const std::string& path) : devicePath_(path) {
        if (!HasEvents()) {
            throw IOException("could not create interrupt listener events", Here());
        }
    }

    using InterruptWatch::DispatchEvent;

    void Listen() override {
        try {
            ReadUntilTheEnd();
        } catch (...) {  // the pipe did not open, or the receiver threw
        }
        ClosePipe();
    }

  private:
    void ClosePipe() override {
        if (const std::shared_ptr<USBConnection> closing = ExchangePipe(nullptr)) {
            closing->Close();
        }
    }

    void ReadUntilTheEnd() {
        std::vector<std::uint8_t> buffer(ReceiveBufferSize);
        const auto connection =
            std::make_shared<USBConnection>(devicePath_, Protocol::NativeDriver::InterruptPipe, Wake());
        ExchangePipe(connection);
        ReportStart();
        while (!EndRequested()) {
            const std::uint32_t count = connection->Read(buffer, EndRequested());
            DispatchEvent(count);
            if (count == 0) {
                break;
            }
        }
    }
    std::shared_ptr<USBConnection> ExchangePipe(std::shared_ptr<USBConnection> connection) {
        const ScopedLock held(lock_);
        return std::exchange(pipe_, std::move(connection));
    }

    const std::string devicePath_;
    std::shared_ptr<USBConnection> pipe_;  ///< guarded by `lock`
};

InterruptListener::InterruptListener(const std::string& devicePath) try
    : watch_(std::make_shared<Watch>(devicePath)) {}
TRACED

InterruptListener::~InterruptListener() {
    try {
        Stop();
        ClearListener();
    } catch (...) {  // nobody is left to tell
    }
}

void InterruptListener::SetListener(std::shared_ptr<EventListener> receiver) try {
    watch_->SetReceiver(std::move(receiver));
}
TRACED

void InterruptListener::ClearListener() try { watch_->SetReceiver(nullptr); }
TRACED

bool InterruptListener::IsTouched() const try { return watch_->IsTouched(); }
TRACED

void InterruptListener::Start() try { watch_->Start(thread_); }
TRACED

void InterruptListener::Stop() try {
    if (thread_) {
        watch_->End(thread_);
    }
}
TRACED

void InterruptListener::Listen() try { watch_->Listen(); }
TRACED

void InterruptListener::DispatchEvent(std::uint32_t count) try { watch_->DispatchEvent(count); }
TRACED

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
