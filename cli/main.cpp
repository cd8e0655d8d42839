#include <exception>
#include <iostream>

#include "Tool.h"

using namespace Varnholt::Cli;

int main(int argc, char** argv) {
    SecureStandardStreams();
    try {
        Interruption interruption;
        const SignalWatch watch([&interruption] { interruption.Request(); });
        Surroundings surroundings{std::cout, std::cerr, FactsOfStandardOutput(), FactsOfStandardError()};
        return static_cast<int>(RunTool({argv + 1, argv + argc}, surroundings, interruption));
    } catch (const std::exception& exception) {
        std::cerr << "ostra: " << exception.what() << '\n';
    }
    return static_cast<int>(ExitCode::Other);
}
