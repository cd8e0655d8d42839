#include "Completions.h"

#include <algorithm>

namespace Varnholt::Manual {

std::string PathOf(const CommandDescription& command, const std::string& separator) {
    std::string path;
    for (const std::string& name : command.path) {
        path += (path.empty() ? "" : separator) + name;
    }
    return path;
}

void VisitAll(const CommandDescription& command,
              const std::function<void(const CommandDescription& found)>& visit) {
    visit(command);
    for (const CommandDescription& next : command.commands) {
        VisitAll(next, visit);
    }
}

std::string Joined(const std::vector<std::string>& texts) {
    std::string joined;
    for (const std::string& text : texts) {
        joined += (joined.empty() ? "" : " ") + text;
    }
    return joined;
}

std::string FunctionName(const CommandDescription& command) {
    std::string name = "_" + PathOf(command, "_");
    std::ranges::replace(name, '-', '_');
    return name;
}

}  // namespace Varnholt::Manual
