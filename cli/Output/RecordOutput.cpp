#include "Output/RecordOutput.h"

#include <algorithm>

#include "ExitCode.h"

namespace Varnholt::Cli {

void RecordOutput::Append(std::span<const char> block, std::uint64_t blockRecords, Form form) {
    const OutputDescriptor::Outcome taken = Take(block);
    if (!taken.error) {
        wholeBytes_ += block.size();
        records_ += blockRecords;
        return;
    }
    if (blockRecords > 0 && form == Form::EqualLength) {
        const std::size_t size = block.size() / static_cast<std::size_t>(blockRecords);
        records_ += taken.accepted / size;
        wholeBytes_ += taken.accepted / size * size;
    } else if (blockRecords > 0) {
        const auto part = block.first(taken.accepted);
        const auto lastEnd = std::find(part.rbegin(), part.rend(), '\n');
        records_ += static_cast<std::uint64_t>(std::count(part.begin(), part.end(), '\n'));
        wholeBytes_ += static_cast<std::uint64_t>(part.rend() - lastEnd);
    }
    if (taken.error == std::errc::operation_canceled) {
        throw Failure(FailureKind::Interrupted, "interrupted");
    }
    Fail(taken.error);
}

}  // namespace Varnholt::Cli
