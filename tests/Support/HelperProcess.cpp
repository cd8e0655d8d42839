#include "Support/HelperProcess.h"

#include <string_view>

namespace Varnholt::TestSupport {

bool RunHelper(int argumentCount, char** arguments, const std::vector<Helper>& helpers, int& exitCode) {
    if (argumentCount < 3 || std::string_view(arguments[1]) != "--helper") {
        return false;
    }
    for (const Helper& helper : helpers) {
        if (std::string_view(arguments[2]) == helper.name) {
            exitCode = helper.run({arguments + 3, arguments + argumentCount});
            return true;
        }
    }
    exitCode = 127;
    return true;
}

}  // namespace Varnholt::TestSupport
