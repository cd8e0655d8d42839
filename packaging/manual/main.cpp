// Writes the manual pages and the completion scripts of the programs: ostra_manual FOLDER
#include <CLI/App.hpp>
#include <exception>
#include <iostream>

#include "Completions.h"
#include "ManualPages.h"
#include "ProgramOptions.h"
#include "ReadCommandLine.h"
#include "TextFile.h"
#include "Tool.h"

using namespace Varnholt;

namespace {

void Write(CLI::App& program, const std::vector<std::string>& seeAlso, const std::filesystem::path& folder) {
    const Manual::CommandDescription description = Manual::ReadCommandLine(program);
    WriteManualPages(description, seeAlso, folder / "man1");
    Manual::WriteTextFile(folder / "bash" / description.name, BashCompletion(description));
    Manual::WriteTextFile(folder / "zsh" / ("_" + description.name), ZshCompletion(description));
    Manual::WriteTextFile(folder / "fish" / (description.name + ".fish"), FishCompletion(description));
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 2) {
        std::cerr << "usage: ostra_manual FOLDER\n";
        return 2;
    }
    try {
        const std::filesystem::path folder(argv[1]);
        Cli::ShowCommandLine([&](CLI::App& tool) {
            Write(tool, {"ostra-simulator(1)", "libostra(3)"}, folder);
        });
        Simulator::ProgramOptions options;
        CLI::App simulator({}, "ostra-simulator");
        Simulator::DefineOptions(simulator, options);
        Write(simulator, {"ostra(1)", "libostra(3)"}, folder);
        return 0;
    } catch (const std::exception& error) {
        std::cerr << "ostra_manual: " << error.what() << "\n";
        return 1;
    }
}
