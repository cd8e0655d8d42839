#include "Commands/MeasurementOutput.h"

#include "Output/ProgressLine.h"
#include "Output/RecordingFile.h"
#include "Output/StreamOutput.h"

namespace Varnholt::Cli {

bool GoesToFile(const std::string& output) {
    return !output.empty() && output != "-";
}

std::unique_ptr<RecordOutput> MakeRecordOutput(Session& session, const std::string& output, bool isRaw) {
    if (GoesToFile(output)) {
        return std::make_unique<RecordingFile>(output, session.UserInterruption());
    }
    if (isRaw) {
        if (session.OutFacts().isTerminal) {
            throw Failure(FailureKind::BadArgument, "raw bytes are no use on a terminal",
                          "write them to a file: --output FILE");
        }
        SetStandardOutputBinary();
    }
    return std::make_unique<StreamOutput>(session.Out());
}

EarlyEnd EndEarly(const Session& session, RecordOutput& output, const std::string& noun, bool discard) {
    const Failure failure = session.Explain(std::current_exception());
    const auto saying = [&failure](const std::string& what) {
        return failure.Saying(failure.Message() + "; " + what);
    };
    const std::uint64_t records = output.Records();
    if (records == 0) {
        output.Discard();
        return {saying("nothing was recorded"), {}};
    }
    const std::string count = CountText(records, noun) + (records == 1 ? " was " : " were ");
    if (discard) {
        output.Discard();
        return {saying(count + "thrown away"), {}};
    }
    const auto [file, earlier] = output.KeepWholeRecords();
    return {saying(count + "written" + (file.empty() ? "" : " to " + file) +
                   (earlier.empty() ? "" : ", and " + earlier + " is as it was")),
            file};
}

}  // namespace Varnholt::Cli
