#include <span>
#include <string>

#include "Interface/HostCall.h"
#include "Interface/Operations.h"
#include "ostra.h"
#include "Utilities/Exceptions/Exceptions.h"

namespace {

using Varnholt::Utilities::Exceptions::Here;
using Varnholt::Utilities::Exceptions::InvalidArgumentException;
using Varnholt::Utilities::Exceptions::RuntimeException;

/// Text of the most recent failure.
std::string lastError;  // NOLINT: an empty string's constructor does not throw

/// Stores the text of a failure in the place of an empty one.
void SetLastError(const char* text) noexcept {
    try {
        lastError = text;
    } catch (...) {  // no memory even for the text: the empty one has to do
    }
}

/// The frame of the two instrument functions: nothing leaves it but a result code and the last-error text.
template <class Operation>
std::int32_t Framed(std::int32_t codeOfRuntimeException, Operation operation) noexcept {
    lastError.clear();
    try {
        const Varnholt::Interface::HostCall call;
        operation();
        return OSTRA_OK;
    } catch (const RuntimeException& exception) {
        SetLastError(exception.what());
        return codeOfRuntimeException;
    } catch (...) {
        SetLastError("unknown error");
        return OSTRA_UNKNOWN_FAILURE;
    }
}

/// A null pointer of the host ends like any other argument that cannot be used.
template <class T>
T* Checked(T* pointer) {
    if (!pointer) {
        throw InvalidArgumentException("null pointer passed", Here());
    }
    return pointer;
}

}  // namespace

std::int32_t f3355d91d5df0e0b(const std::uint8_t* image, const char* deviceName) {
    return Framed(OSTRA_UNKNOWN_FAILURE, [&] {
        Varnholt::Interface::WriteImage(
            std::span<const std::uint8_t, OSTRA_IMAGE_SIZE>(Checked(image), OSTRA_IMAGE_SIZE),
            Checked(deviceName));
    });
}

std::int32_t d4fb86cecc88582a(std::int32_t* values, const char* deviceName) {
    return Framed(OSTRA_FAILURE, [&] {
        Varnholt::Interface::TakeReadout(
            std::span<std::int32_t, OSTRA_READOUT_VALUES>(Checked(values), OSTRA_READOUT_VALUES),
            Checked(deviceName));
    });
}

const char* b5ae189db26b2a1b(const char* key) {
    static std::string infoResult;
    infoResult.clear();
    if (!key) {
        lastError.clear();
        return infoResult.c_str();
    }
    try {
        if (std::string_view(key) == "LastError") {
            infoResult = lastError;
        } else {
            lastError.clear();
            if (std::string_view(key) == "SDKVersion") {
                infoResult = "1.0.3";
            }
        }
    } catch (...) {  // no memory for the text: an empty one is all there is
    }
    return infoResult.c_str();
}

const char* c288a3930ffaa9d7(void) {
    static const std::string fixedResult;
    lastError.clear();
    return fixedResult.c_str();
}
