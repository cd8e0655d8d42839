#include "Service/Finding.h"

#include <fmt/format.h>

#include "Service/OpenedInstrument.h"

namespace Varnholt::Service {

Answer TryInstrument(Context& context, const std::string& identifier) {
    try {
        OpenedInstrument instrument(context, FindInstrument(context, identifier));
        return instrument.Do([](const OpenedInstrument::Commands& commands) {
            std::uint8_t m1 = 0, m3 = 0;
            std::uint16_t m2 = 0, m4 = 0, m5 = 0;
            commands->GetMISC(m1, m2, m3, m4, m5);
            return Answer{m2, std::nullopt};
        });
    } catch (...) {
        return {.failure = context.Explain(std::current_exception())};
    }
}

Finding JudgeAnswer(const std::string& subject, const Answer& answer) {
    using Level = Finding::Level;
    if (!answer.failure) {
        return {Level::Good, subject, fmt::format("answers (firmware {})", answer.firmware), ""};
    }
    const Failure& failure = *answer.failure;
    const std::string fix =
        failure.Advice().empty()
            ? "unplug it and plug it in again; if that does not help, its firmware does not run"
            : failure.Advice();
    return {Level::Problem, subject, "does not answer: " + failure.Message(), fix, failure.Kind()};
}

}  // namespace Varnholt::Service
