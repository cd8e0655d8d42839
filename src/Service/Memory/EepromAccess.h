#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "Service/Memory/EepromImage.h"
#include "Service/OpenedInstrument.h"

namespace Varnholt::Service {

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
EepromImage ReadEeprom(OpenedInstrument& instrument);
/// Reads it twice; two readings that differ are a failure. For what somebody will rely on.
EepromImage ReadEepromTwice(OpenedInstrument& instrument);

/// Writes the pieces, reads everything back and compares it. A failure, an interruption and a difference end
/// in a `Failure` that says how far the writing came and, in the words of `wayBack`, how it is undone.
void WriteEeprom(OpenedInstrument& instrument, const EepromImage& wanted,
                 const std::vector<WritePiece>& pieces, const std::string& wayBack);

/// What keeps a change of the EEPROM from losing its content.
struct WriteSafeguard {
    /// Keeps the earlier content before anything is written, and answers how that is called; empty: not at
    /// all.
    std::function<std::string()> keep;
    /// How a write that failed is undone, for the user; `kept` is what `keep` has answered.
    std::function<std::string(const std::string& kept)> wayBack;
};
struct WrittenChange {
    std::size_t pieces = 0;
    std::string kept;  ///< what `keep` has answered; empty where nothing was to be written
};
/// Makes `present`, which was read from it, into `wanted` the safe way: keeps what was there, writes only
/// what differs, reads everything back and compares it.
WrittenChange ChangeEeprom(OpenedInstrument& instrument, const EepromImage& present,
                           const EepromImage& wanted, Granularity granularity,
                           const WriteSafeguard& safeguard);

/// Saves the content of an instrument in a file that must not exist; without a name it is in the current
/// folder, under one that tells instrument, chip and time. Answers the name.
std::string SaveBackup(OpenedInstrument& instrument, const EepromImage& content, const std::string& file);

}  // namespace Varnholt::Service
