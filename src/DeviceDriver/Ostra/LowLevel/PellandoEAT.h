#pragma once

#include <cstdint>
#include <optional>
#include <vector>

#include "DeviceDriver/Generic/Configuration/Properties.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

class PellandoLog;

/// The EEPROM's allocation table: where each stored value lies. Each entry has an identifier and an address;
/// a value's size is the distance to the entry behind it, so every section closes with an entry that marks
/// its end (identifiers 1, 2 and 3). Values of the second log stand under their identifier plus 1000.
///
/// What a table from an instrument says of addresses is not trusted: `SectionReader` refuses what lies
/// outside the image.
class PellandoEAT final {
  public:
    using Properties = Generic::Configuration::Properties;

    static constexpr const char* CorruptTable = "corrupt EAT detected!!";

    /// An empty table, to be filled with `InitializeEmtpyEAT`.
    PellandoEAT() = default;
    /// Parses the 512 bytes from `table` on.
    explicit PellandoEAT(std::vector<std::uint8_t>::const_iterator table);
    PellandoEAT(const PellandoEAT&) = delete;
    PellandoEAT& operator=(const PellandoEAT&) = delete;

    /// Adds the table in the 512 bytes at `buffer` to what this one holds, and takes its version and length.
    /// A version other than 1 or a length outside 300 to 512 is refused with `DataException` "corrupt EAT
    /// detected!!" and changes nothing. Entries are read while they begin before the length. An identifier
    /// that is there already, or is repeated, keeps its first place and gets its last address.
    ///
    /// The last entry of a length from 509 on would end behind the table's 512 bytes, in the calibration
    /// data: it is left out.
    void ParseBuffer(const std::uint8_t* buffer);

    /// Both refuse an unknown identifier with `ResourceException` "id N doesn't exist". `SizeOf` also refuses
    /// the table's last entry in this way, since nothing says where it ends, and with `DataException` two
    /// addresses whose distance is no 32-bit number.
    std::int32_t AddressOf(std::uint16_t id) const;
    std::int32_t SizeOf(std::uint16_t id) const;

    /// Whether the entry's address plus `count` is less than 4096; the sum alone decides, whatever the
    /// address.
    bool IsEntryInLogArea(std::uint16_t id, std::uint32_t count) const;

    /// Makes room for values whose size has changed: behind each such value the set's later identifiers move
    /// by the difference. Nothing else moves, and the order stays. A failure (an identifier that the table
    /// lacks) restores the table.
    void EnsureConsistency(const Properties& set);
    void EnsureConsistency(const PellandoLog& log);
    /// Makes the table fit an image in which the values of `set`, under their identifiers plus `idOffset`,
    /// lie one behind the other: moves what `EnsureConsistency` moves, which knows no offset, and the section
    /// end that follows the set's last identifier in the table. Were the end left behind, the last value
    /// would be read back with a wrong size. A failure restores the table.
    void FitSection(const Properties& set, std::uint16_t idOffset);

    /// Whether the table finds the values of `set`, under their identifiers plus `idOffset`, where they lie
    /// when they are dumped one behind the other from `start` on. Nothing here insists on it: it is for those
    /// who check an image before they write it.
    bool Locates(const Properties& set, std::uint32_t start, std::uint16_t idOffset) const;

    /// Writes header and entries from `first` on. A range that is too short is refused with
    /// `ResourceException` after the header has been written.
    void Dump(std::vector<std::uint8_t>::iterator first, std::vector<std::uint8_t>::iterator last) const;

    /// Adds the sections of a fresh instrument and sets version and length.
    void InitializeEmtpyEAT();
    /// Appends the addresses of the values of `defaults`, laid back to back from `start` on, under their
    /// identifiers plus `idOffset`, and behind them the end under `sectionId`.
    void CreateSection(const Properties& defaults, std::uint32_t start, std::uint16_t sectionId,
                       std::uint32_t idOffset);

    /// Identifiers and addresses (`TypeLong`) in table order.
    const Properties& GetDatastore() const { return datastore_; }
    Properties& GetDatastore() { return datastore_; }

    /// What the sections of a fresh EEPROM hold, in order; the same object with each call.
    static const Properties& GetDefaultCalibrationData();
    static const Properties& GetDefaultLogData();

  private:
    /// Keeps a copy of the datastore for the case that something fails, made before the first change: mostly
    /// there is none.
    using Backup = std::optional<Properties>;
    void MoveFor(const Properties& set, std::uint16_t idOffset, Backup& before);
    void MoveSectionEnd(const Properties& set, std::uint16_t idOffset, Backup& before);
    void MoveTo(std::uint16_t id, std::int64_t address, Backup& before);
    void Restore(Backup& before);

    std::uint16_t version_ = 0;
    std::uint16_t length_ = 0;
    Properties datastore_;
};

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
