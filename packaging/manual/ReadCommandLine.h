#pragma once

#include "CommandDescription.h"

namespace CLI {
class App;
}

namespace Varnholt::Manual {

/// What the parser of a program knows of its command line.
CommandDescription ReadCommandLine(CLI::App& program);

}  // namespace Varnholt::Manual
