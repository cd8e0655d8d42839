#include "Platform/Linux/ErrnoCodes.h"

#include <algorithm>
#include <array>
#include <cerrno>

namespace Varnholt::Platform::Linux {
namespace {

struct Meaning {
    ErrorCode code;
    std::array<int, 5> numbers;
};

/// `ELOOP` is a symbolic link where none may be.
constexpr Meaning Meanings[] = {
    {Errors::Success, {0}},
    {Errors::FileNotFound, {ENOENT}},
    {Errors::PathNotFound, {ENOTDIR}},
    {Errors::AccessDenied, {EACCES, EPERM, EROFS, ELOOP, EISDIR}},
    {Errors::InvalidHandle, {EBADF}},
    {Errors::NotEnoughMemory, {ENOMEM}},
    {Errors::InvalidParameter, {EINVAL, ENAMETOOLONG}},
    {Errors::Busy, {EBUSY, EAGAIN}},
    {Errors::CallNotImplemented, {ENOSYS}},
    {Errors::NotSupported, {EOPNOTSUPP}},
    {Errors::SemaphoreTimeout, {ETIMEDOUT}},
    {Errors::OperationAborted, {ECANCELED}},
    {Errors::DeviceNotConnected, {ENODEV, ENXIO, ESHUTDOWN}},
    {Errors::NoSystemResources, {EMFILE, ENFILE, ENOSPC, EDQUOT}},
};

}  // namespace

ErrorCode CodeOf(int errnoValue) {
    const auto* const found = std::ranges::find_if(Meanings, [errnoValue](const Meaning& meaning) {
        return std::ranges::find(meaning.numbers, errnoValue) != meaning.numbers.end();
    });
    return found != std::end(Meanings) ? found->code : Errors::GeneralFailure;
}

}  // namespace Varnholt::Platform::Linux
