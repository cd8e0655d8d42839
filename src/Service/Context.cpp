#include "Service/Context.h"

#include "Service/Instruments.h"
#include "Utilities/Files/FileError.h"

namespace Varnholt::Service {
namespace {

/// What this layer has found itself says already which instrument or file it is about.
bool IsOwn(const std::exception_ptr& exception) {
    try {
        std::rethrow_exception(exception);
    } catch (const Failure&) {
        return true;
    } catch (const Utilities::Files::FileError&) {
        return true;
    } catch (...) {
        return false;
    }
}

}  // namespace

Context::Context(Observer& toldObserver, Interruption& userInterruption, InterruptibleDeviceFiles& usedFiles,
                 std::string deviceIdentifier)
    : observer_(toldObserver),
      interruption_(userInterruption),
      files_(usedFiles),
      device_(std::move(deviceIdentifier)) {
    interruption_.SetAction([this] { files_.Interrupt(device_); });
}

Context::~Context() {
    interruption_.SetAction({});
}

void Context::Sleep(std::uint32_t milliseconds) const {
    interruption_.Sleep(milliseconds);
    interruption_.ThrowIfRequested();
}

Failure Context::Explain(const std::exception_ptr& exception, const std::string& identifier) const {
    Failure failure = Describe(exception);
    if (IsOwn(exception)) {
        return failure;
    }
    if (interruption_.IsRequested()) {
        return {FailureKind::Interrupted, "interrupted"};
    }
    if (identifier.empty()) {
        return failure;
    }
    const bool canBeUnplugged = failure.IsOfTransfer() || failure.Kind() == FailureKind::Timeout;
    if (canBeUnplugged && !IsConnected(*this, identifier)) {
        return Failure(FailureKind::Unplugged, "unplugged (" + failure.Message() + ")",
                       "plug it in again; `ostra list` shows whether it is found", failure.DriverText())
            .Of(identifier);
    }
    return failure.Of(identifier);
}

}  // namespace Varnholt::Service
