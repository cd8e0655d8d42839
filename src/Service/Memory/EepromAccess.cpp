#include "Service/Memory/EepromAccess.h"

#include <fmt/format.h>

#include <algorithm>
#include <filesystem>
#include <span>

#include "Platform/Time.h"
#include "Protocol/Instrument.h"
#include "Utilities/Files/AtomicFile.h"

namespace Varnholt::Service {
namespace {

constexpr std::uint32_t Half = Protocol::EepromSize / 2;
constexpr std::uint32_t ElementSize = 4;

/// How far a write came.
struct Advance {
    bool begun = false;  ///< the EEPROM may differ from what it was: a piece that failed may be there in part
    std::size_t sent = 0;  ///< pieces that the instrument has taken
};

void WritePieces(OpenedInstrument& instrument, const EepromImage& wanted,
                 const std::vector<WritePiece>& pieces, Advance& advance) {
    const Context& context = instrument.UsedContext();
    const auto progress = context.Told().StartProgress("writing", pieces.size(), "pieces");
    for (const WritePiece& piece : pieces) {
        context.UserInterruption().ThrowIfRequested();
        advance.begun = true;
        const auto bytes = std::span(wanted).subspan(piece.address, piece.length);
        instrument.Do([&](const OpenedInstrument::Commands& commands) {
            commands->WriteEEPROM(piece.address, {bytes.begin(), bytes.end()});
        });
        progress->Update(++advance.sent);
    }
}

void Verify(OpenedInstrument& instrument, const EepromImage& wanted) {
    const EepromImage found = ReadEeprom(instrument);
    const auto different = std::mismatch(wanted.begin(), wanted.end(), found.begin());
    if (different.first != wanted.end()) {
        throw Failure(FailureKind::TransferFailed,
                      fmt::format("what was written reads back differently from address {} on",
                                  different.first - wanted.begin()))
            .Of(instrument.Identifier());
    }
}

/// A name that tells instrument, chip and time, and that no file has yet.
std::string NewBackupName(OpenedInstrument& instrument) {
    std::string name = ShortNameOf(instrument.Identifier());
    for (char& c : name) {
        const bool isPlain = (c >= '0' && c <= '9') || (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') ||
                             c == '-' || c == '.' || c == '_';
        c = isPlain ? c : '_';
    }
    const Platform::CalendarTime now = Platform::LocalCalendarTime(Platform::WallClockNow().seconds);
    const std::string base =
        fmt::format("ostra-{}-{}-{:04}{:02}{:02}-{:02}{:02}{:02}", name, instrument.ChipId(), now.year,
                    now.month, now.day, now.hour, now.minute, now.second);
    std::error_code error;
    for (int number = 1;; ++number) {
        std::string candidate = base + (number == 1 ? "" : fmt::format("-{}", number)) + ".eeprom";
        if (!std::filesystem::exists(candidate, error)) {
            return candidate;
        }
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

EepromImage ReadEeprom(OpenedInstrument& instrument) {
    const auto progress = instrument.UsedContext().Told().StartProgress("reading", Protocol::EepromSize, "B");
    EepromImage image;
    for (std::uint32_t at = 0; at < Protocol::EepromSize; at += Half) {
        std::vector<std::uint8_t> part(Half);
        instrument.Do([&](const OpenedInstrument::Commands& commands) { commands->ReadEEPROM(at, part); });
        image.insert(image.end(), part.begin(), part.end());
        progress->Update(image.size());
    }
    return image;
}

EepromImage ReadEepromTwice(OpenedInstrument& instrument) {
    EepromImage image = ReadEeprom(instrument);
    if (ReadEeprom(instrument) != image) {
        throw Failure(FailureKind::TransferFailed, "two readings of the EEPROM differ; nothing was written",
                      "try another cable or port")
            .Of(instrument.Identifier());
    }
    return image;
}

void WriteEeprom(OpenedInstrument& instrument, const EepromImage& wanted,
                 const std::vector<WritePiece>& pieces, const std::string& wayBack) {
    // Nothing is cut off in the middle: an interruption is looked for between two pieces.
    const Interruption::Deferral deferral(instrument.UsedContext().UserInterruption());
    Advance advance;
    try {
        WritePieces(instrument, wanted, pieces, advance);
        Verify(instrument, wanted);
    } catch (...) {
        const Failure failure =
            instrument.UsedContext().Explain(std::current_exception(), instrument.Identifier());
        if (!advance.begun) {
            throw failure.Saying(failure.Message() + "; nothing was written");
        }
        throw failure
            .Saying(fmt::format("{}; {} of {} pieces had been sent", failure.Message(), advance.sent,
                                pieces.size()))
            .Advising(wayBack);
    }
}

WrittenChange ChangeEeprom(OpenedInstrument& instrument, const EepromImage& present,
                           const EepromImage& wanted, Granularity granularity,
                           const WriteSafeguard& safeguard) {
    const std::vector<WritePiece> pieces = PiecesToWrite(present, wanted, granularity);
    WrittenChange change{pieces.size(), {}};
    if (!pieces.empty()) {
        change.kept = safeguard.keep();
        WriteEeprom(instrument, wanted, pieces, safeguard.wayBack(change.kept));
    }
    return change;
}

std::string SaveBackup(OpenedInstrument& instrument, const EepromImage& content, const std::string& file) {
    using Utilities::Files::AtomicFile;
    std::string name = file.empty() ? NewBackupName(instrument) : file;
    try {
        Utilities::Files::WriteFileAtomically(name, content, AtomicFile::IfItExists::Refuse);
    } catch (...) {
        if (!file.empty()) {
            throw Describe(std::current_exception());
        }
        const Failure failure = Describe(std::current_exception());
        throw failure.Saying("no backup can be made in the current folder, and nothing was changed: " +
                             failure.Message());
    }
    instrument.UsedContext().Told().Note("backup of " + instrument.Identifier() + " written to " + name);
    return name;
}

}  // namespace Varnholt::Service
