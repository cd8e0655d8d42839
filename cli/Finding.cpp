#include "Finding.h"

#include <fmt/format.h>

#include "Instrument.h"

namespace Varnholt::Cli {

Answer TryInstrument(Session& session, const std::string& identifier) {
    try {
        Instrument instrument(session, {identifier, ""});
        std::uint8_t m1 = 0, m3 = 0;
        std::uint16_t m2 = 0, m4 = 0, m5 = 0;
        instrument.Commands().GetMISC(m1, m2, m3, m4, m5);
        return {m2, std::nullopt};
    } catch (...) {
        FailureReport failure = session.Explain(std::current_exception());
        if (failure.message.starts_with(identifier + ": ")) {
            failure.message.erase(0, identifier.size() + 2);  // a finding begins with its subject
        }
        return {0, failure};
    }
}

Finding JudgeAnswer(const std::string& subject, const Answer& answer) {
    using Level = Finding::Level;
    if (!answer.failure) {
        return {Level::Good, subject, fmt::format("answers (firmware {})", answer.firmware), ""};
    }
    const FailureReport& failure = *answer.failure;
    const std::string fix =
        failure.advice.empty()
            ? "unplug it and plug it in again; if that does not help, its firmware does not run"
            : failure.advice;
    return {Level::Problem, subject, "does not answer: " + failure.message, fix, failure.code};
}

}  // namespace Varnholt::Cli
