#include "Platform/Linux/ErrnoCodes.h"

#include <cerrno>

namespace Varnholt::Platform::Linux {

ErrorCode CodeOf(int errnoValue) {
    switch (errnoValue) {
        case 0:
            return Errors::Success;
        case ENOENT:
            return Errors::FileNotFound;
        case ENOTDIR:
            return Errors::PathNotFound;
        case EACCES:
        case EPERM:
        case EROFS:
        case ELOOP:  // a symbolic link where none may be
        case EISDIR:
            return Errors::AccessDenied;
        case EBADF:
            return Errors::InvalidHandle;
        case ENOMEM:
            return Errors::NotEnoughMemory;
        case EINVAL:
        case ENAMETOOLONG:
            return Errors::InvalidParameter;
        case EBUSY:
        case EAGAIN:
            return Errors::Busy;
        case ENOSYS:
            return Errors::CallNotImplemented;
        case EOPNOTSUPP:
            return Errors::NotSupported;
        case ETIMEDOUT:
            return Errors::SemaphoreTimeout;
        case ECANCELED:
            return Errors::OperationAborted;
        case ENODEV:
        case ENXIO:
        case ESHUTDOWN:
            return Errors::DeviceNotConnected;
        case EMFILE:
        case ENFILE:
        case ENOSPC:
        case EDQUOT:
            return Errors::NoSystemResources;
        default:
            return Errors::GeneralFailure;
    }
}

}  // namespace Varnholt::Platform::Linux
