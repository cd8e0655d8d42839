#include <exception>
#include <iostream>

#include "Output/DescriptorStream.h"
#include "Tool.h"

using namespace Varnholt::Cli;

int main(int argc, char** argv) {
    SecureStandardStreams();
    try {
        Varnholt::Service::Interruption interruption;
        const SignalWatch watch([&interruption] { interruption.Request(); });
        // Both can be stopped, by a reader that does not read or a terminal that is held: then too the user's
        // wish to end is seen.
        DescriptorStream out(OutputDescriptor::Of(Standard::Output), interruption,
                             DescriptorStream::Lost::IsFailure);
        DescriptorStream err(OutputDescriptor::Of(Standard::Error), interruption,
                             DescriptorStream::Lost::IsIgnored);
        err << std::unitbuf;
        err.tie(&out);
        DescriptorStream log(OutputDescriptor::Of(Standard::Error), interruption,
                             DescriptorStream::Lost::IsIgnored);
        log << std::unitbuf;
        Streams streams{out, err, log, FactsOf(Standard::Output), FactsOf(Standard::Error)};
        return static_cast<int>(RunTool({argv + 1, argv + argc}, streams, interruption));
    } catch (const std::exception& exception) {
        std::cerr << "ostra: " << exception.what() << '\n';
    }
    return static_cast<int>(ExitCode::Other);
}
