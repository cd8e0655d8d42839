#include "StandIn.h"

#include <memory>
#include <new>

#include "KernelStatus.h"
#include "StandInFile.h"
#include "StandInInstrument.h"

// The driver holds these; each keeps its object alive.
struct StandInInstrument {
    std::shared_ptr<Varnholt::Simulator::StandInInstrumentObject> object;
};
struct StandInFile {
    std::shared_ptr<Varnholt::Simulator::StandInFileObject> object;
};

namespace {

namespace Errors = Varnholt::Platform::Errors;
using Varnholt::Platform::Operation;
using Varnholt::Simulator::KernelStatus;

/// Nothing is thrown into the driver.
template <class Function>
Status Guarded(Function function) noexcept {
    try {
        return function();
    } catch (const std::bad_alloc&) {
        return KernelStatus(Errors::NoSystemResources);
    } catch (...) {
        return KernelStatus(Errors::GeneralFailure);
    }
}

std::uint32_t Size(const void* buffer, unsigned long length) {
    return static_cast<std::uint32_t>(buffer != nullptr ? length : 0);
}

}  // namespace

StandInInstrument* StandInPlugIn(unsigned long index) {
    StandInInstrument* made = nullptr;
    Guarded([&] {
        made = new StandInInstrument{std::make_shared<Varnholt::Simulator::StandInInstrumentObject>(index)};
        return Status{};
    });
    return made;
}

void StandInUnplug(StandInInstrument* instrument) {
    instrument->object->Unplug();
    delete instrument;
}

int StandInIsUsedElsewhere(const StandInInstrument* instrument) {
    return instrument->object->IsUsedElsewhere() ? 1 : 0;
}

Status StandInOpen(StandInInstrument* instrument, int usbIo, unsigned long pipe, StandInFile** file) {
    return Guarded([&] {
        Varnholt::Platform::ErrorCode error = Errors::Success;
        auto driver = instrument->object->Open(usbIo != 0, static_cast<std::uint32_t>(pipe), error);
        if (!driver) {
            return KernelStatus(error);
        }
        const auto opened =
            std::make_shared<Varnholt::Simulator::StandInFileObject>(instrument->object, std::move(driver));
        instrument->object->Add(opened);
        *file = new StandInFile{opened};
        return KernelStatus(Errors::Success);
    });
}

void StandInClose(StandInFile* file) {
    file->object->CancelAll();
    delete file;
}

Status StandInTransfer(StandInFile* file, int reads, void* buffer, unsigned long length,
                       StandInRequest request, unsigned long* bytes) {
    return Guarded([&] {
        const std::uint32_t size = Size(buffer, length);
        return file->object->Start(
            reads != 0 ? Operation::Read(buffer, size) : Operation::Write(buffer, size), request, *bytes);
    });
}

Status StandInControl(StandInFile* file, unsigned long code, const void* input, unsigned long inputLength,
                      void* output, unsigned long outputLength, StandInRequest request,
                      unsigned long* bytes) {
    return Guarded([&] {
        const std::span block(static_cast<const std::uint8_t*>(input), Size(input, inputLength));
        return file->object->Start(
            Operation::Control(static_cast<std::uint32_t>(code), block, output, Size(output, outputLength)),
            request, *bytes);
    });
}

void StandInCancel(StandInFile* file, unsigned long requestNumber) {
    file->object->Cancel(requestNumber);
}
