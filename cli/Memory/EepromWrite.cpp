#include "Memory/EepromWrite.h"

#include <fmt/format.h>

#include <algorithm>
#include <span>

#include "Protocol/Instrument.h"

namespace Varnholt::Cli {
namespace {

constexpr std::uint32_t Half = Protocol::EepromSize / 2;
constexpr std::uint32_t ElementSize = 4;

/// How far a write came.
struct Advance {
    bool begun = false;  ///< the EEPROM may differ from what it was: a piece that failed may be there in part
    std::size_t sent = 0;  ///< pieces that the instrument has taken
};

void WritePieces(Session& session, Instrument& instrument, const EepromImage& wanted,
                 const std::vector<WritePiece>& pieces, Advance& advance) {
    Progress progress = session.MakeProgress("writing", pieces.size(), "pieces");
    for (const WritePiece& piece : pieces) {
        session.UserInterruption().ThrowIfRequested();
        advance.begun = true;
        const auto bytes = std::span(wanted).subspan(piece.address, piece.length);
        instrument.Commands().WriteEEPROM(piece.address, {bytes.begin(), bytes.end()});
        progress.Update(++advance.sent);
    }
}

void Verify(Session& session, Instrument& instrument, const EepromImage& wanted) {
    const EepromImage found = ReadEeprom(session, instrument);
    const auto different = std::mismatch(wanted.begin(), wanted.end(), found.begin());
    if (different.first != wanted.end()) {
        throw ToolFailure(ExitCode::InputOutput,
                          fmt::format("{}: what was written reads back differently from address {} on",
                                      instrument.Identifier(), different.first - wanted.begin()));
    }
}

}  // namespace

std::vector<WritePiece> PiecesToWrite(const EepromImage& present, const EepromImage& wanted,
                                      Granularity granularity) {
    const std::uint32_t step = granularity == Granularity::Pieces ? Protocol::EepromWritePiece : ElementSize;
    std::vector<WritePiece> pieces;
    for (std::uint32_t at = 0; at < Protocol::EepromSize; at += step) {
        if (std::equal(wanted.data() + at, wanted.data() + at + step, present.data() + at)) {
            continue;
        }
        const bool continues = !pieces.empty() && pieces.back().address + pieces.back().length == at &&
                               pieces.back().length + step <= Protocol::EepromWritePiece;
        if (continues) {
            pieces.back().length += step;
        } else {
            pieces.push_back({at, step});
        }
    }
    return pieces;
}

EepromImage ReadEeprom(Session& session, Instrument& instrument) {
    Progress progress = session.MakeProgress("reading", Protocol::EepromSize, "B");
    EepromImage image;
    for (std::uint32_t at = 0; at < Protocol::EepromSize; at += Half) {
        std::vector<std::uint8_t> part(Half);
        instrument.Commands().ReadEEPROM(at, part);
        image.insert(image.end(), part.begin(), part.end());
        progress.Update(image.size());
    }
    return image;
}

EepromImage ReadEepromTwice(Session& session, Instrument& instrument) {
    EepromImage image = ReadEeprom(session, instrument);
    if (ReadEeprom(session, instrument) != image) {
        throw ToolFailure(
            ExitCode::InputOutput,
            instrument.Identifier() + ": two readings of the EEPROM differ; nothing was written",
            "try another cable or port");
    }
    return image;
}

void WriteEeprom(Session& session, Instrument& instrument, const EepromImage& wanted,
                 const std::vector<WritePiece>& pieces, const std::string& wayBack) {
    // Nothing is cut off in the middle: an interruption is looked for between two pieces.
    const Interruption::Deferral deferral(session.UserInterruption());
    Advance advance;
    try {
        WritePieces(session, instrument, wanted, pieces, advance);
        Verify(session, instrument, wanted);
    } catch (...) {
        const FailureReport report = session.Explain(std::current_exception());
        if (!advance.begun) {
            throw ToolFailure(report.code, report.message + "; nothing was written", report.advice);
        }
        throw ToolFailure(
            report.code,
            fmt::format("{}; {} of {} pieces had been sent", report.message, advance.sent, pieces.size()),
            wayBack);
    }
}

}  // namespace Varnholt::Cli
