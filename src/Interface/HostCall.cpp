#include "Interface/HostCall.h"

namespace Varnholt::Interface {

HostCall::HostCall() = default;
HostCall::~HostCall() = default;

}  // namespace Varnholt::Interface
