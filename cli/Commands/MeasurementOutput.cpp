#include "Commands/MeasurementOutput.h"

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
            throw ToolFailure(ExitCode::Usage, "raw bytes are no use on a terminal",
                              "write them to a file: --output FILE");
        }
        SetStandardOutputBinary();
    }
    return std::make_unique<StreamOutput>(session.Out());
}

std::string CountText(std::uint64_t count, const std::string& noun) {
    return std::to_string(count) + " " + noun + (count == 1 ? "" : "s");
}

EarlyEnd EndEarly(const Session& session, RecordOutput& output, const std::string& noun, bool discard) {
    EarlyEnd end{session.Explain(std::current_exception()), {}};
    const std::uint64_t records = output.Records();
    if (records == 0) {
        output.Discard();
        end.failure.message += "; nothing was recorded";
        return end;
    }
    const std::string count = CountText(records, noun) + (records == 1 ? " was " : " were ");
    if (discard) {
        output.Discard();
        end.failure.message += "; " + count + "thrown away";
        return end;
    }
    const RecordOutput::Remains remains = output.KeepWholeRecords();
    end.file = remains.file;
    end.failure.message += "; " + count + "written";
    if (!remains.file.empty()) {
        end.failure.message += " to " + remains.file;
    }
    if (!remains.earlier.empty()) {
        end.failure.message += ", and " + remains.earlier + " is as it was";
    }
    return end;
}

}  // namespace Varnholt::Cli
