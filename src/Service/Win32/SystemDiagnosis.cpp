#include "Service/Win32/Diagnosis.h"

namespace Varnholt::Service {

std::vector<Finding> Diagnose(Context& context) {
    return DiagnoseDrivers(context);
}

}  // namespace Varnholt::Service
