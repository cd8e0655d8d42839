#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "Instrument.h"
#include "Memory/InputFile.h"

namespace Varnholt::Cli {

/// Bytes of the EEPROM that are written in one piece.
struct WritePiece {
    std::uint32_t address;
    std::uint32_t length;
};

enum class Granularity {
    Pieces,    ///< the whole pieces of 256 bytes that differ: for whole images
    Elements,  ///< the elements of 4 bytes that differ and no others
};

/// What has to be written to make `present` into `wanted`, in order of address, each piece at most 256 bytes.
std::vector<WritePiece> PiecesToWrite(const EepromImage& present, const EepromImage& wanted,
                                      Granularity granularity);

/// Reads the whole EEPROM, as it is.
EepromImage ReadEeprom(Session& session, Instrument& instrument);
/// Reads it twice; two readings that differ are a failure. For what somebody will rely on.
EepromImage ReadEepromTwice(Session& session, Instrument& instrument);

/// Writes the pieces, reads everything back and compares it. A failure, an interruption and a difference end
/// in `ToolFailure` that says how far the writing came and, in the words of `wayBack`, how it is undone.
void WriteEeprom(Session& session, Instrument& instrument, const EepromImage& wanted,
                 const std::vector<WritePiece>& pieces, const std::string& wayBack);

}  // namespace Varnholt::Cli
