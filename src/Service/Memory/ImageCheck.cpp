#include "Service/Memory/ImageCheck.h"

#include <fmt/format.h>

#include <algorithm>
#include <cmath>
#include <set>
#include <span>

#include "DeviceDriver/Ostra/LowLevel/ConfigurationDataConverter.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoEAT.h"
#include "Protocol/ByteOrder.h"
#include "Protocol/EepromMap.h"
#include "Service/Memory/ImageEdit.h"
#include "Service/Memory/ImageModel.h"
#include "Service/Memory/PropertyText.h"

namespace Varnholt::Service {
namespace {

using namespace DeviceDriver::Ostra::LowLevel;
using DeviceDriver::Generic::Configuration::Properties;
using Severity = ImageFinding::Severity;
namespace Map = Protocol::EepromMap;
namespace Layout = Protocol::EepromMap::TableLayout;

constexpr const char* TableArea = "table";
constexpr const char* LogArea = "log";
constexpr const char* CalibrationArea = "calibration";

struct Place {
    std::uint16_t id;
    std::int64_t first;
    std::int64_t end;
};

std::string Listed(const std::vector<std::uint16_t>& ids) {
    constexpr std::size_t most = 8;
    const std::span<const std::uint16_t> shown(ids.data(), std::min(ids.size(), most));
    return fmt::format("{}{}", fmt::join(shown, ", "),
                       ids.size() > most ? fmt::format(" and {} more", ids.size() - most) : "");
}

bool IsSectionEnd(std::uint16_t id) {
    return id == Map::EndOfMainLog || id == Map::EndOfCalibration || id == Map::EndOfLogCopy;
}

/// The property that an entry holds, without the offset of the second log; 0 for none.
std::uint16_t PropertyOfEntry(std::uint16_t id) {
    if (ConfigurationDataConverter::IsLogParameter(id) ||
        ConfigurationDataConverter::IsCalibrationParameter(id)) {
        return id;
    }
    const auto below = static_cast<std::uint16_t>(id - Map::LogCopyIdOffset);
    return id >= Map::LogCopyIdOffset && ConfigurationDataConverter::IsLogParameter(below) ? below
                                                                                           : std::uint16_t{0};
}

std::size_t CountUsed(std::span<const std::uint8_t> bytes) {
    return bytes.size() - static_cast<std::size_t>(std::count(bytes.begin(), bytes.end(), 0xFF));
}

class Checker final {
  public:
    explicit Checker(const EepromImage& checked) : image_(checked) {}

    std::vector<ImageFinding> Run() {
        if (CheckHeader()) {
            const PellandoEAT table = TableOf(image_);
            CheckEntries(table);
            CheckPlaces(table);
            CheckModel(table);
        }
        CheckOtherAreas();
        return std::move(findings_);
    }

  private:
    void Add(Severity severity, const char* area, std::string text) {
        findings_.push_back({severity, area, std::move(text)});
    }

    /// The properties that something is wrong with, if there are any.
    void AddListed(Severity severity, const char* area, const char* lead,
                   const std::vector<std::uint16_t>& ids) {
        if (!ids.empty()) {
            Add(severity, area, lead + Listed(ids));
        }
    }

    bool CheckHeader() {
        const std::uint16_t version = Protocol::LoadBig16(&image_[Map::Table + Layout::Version]);
        const std::uint16_t length = Protocol::LoadBig16(&image_[Map::Table + Layout::Length]);
        if (version != Layout::KnownVersion) {
            Add(Severity::Error, TableArea,
                fmt::format("version {} instead of {}: the driver refuses the image", version,
                            Layout::KnownVersion));
            return false;
        }
        if (length < Layout::ShortestLength || length > Layout::LongestLength) {
            Add(Severity::Error, TableArea,
                fmt::format("length {} instead of {} to {}: the driver refuses the image", length,
                            Layout::ShortestLength, Layout::LongestLength));
            return false;
        }
        Add(Severity::Fine, TableArea, fmt::format("version {}, {} bytes", version, length));
        if ((length - Layout::FirstEntry) % Layout::EntrySize != 0) {
            Add(Severity::Warning, TableArea, "the length does not end with an entry");
        }
        return true;
    }

    void CheckEntries(const PellandoEAT& table) {
        const Properties& entries = table.GetDatastore();
        std::vector<std::uint16_t> unknown;
        for (const auto& [id, address] : entries.GetDatastore()) {
            if (PropertyOfEntry(id) == 0 && !IsSectionEnd(id)) {
                unknown.push_back(id);
            }
        }
        // An entry that the length cuts off counts, and one that the area cuts off does not.
        const std::uint32_t length = Protocol::LoadBig16(&image_[Map::Table + Layout::Length]);
        const std::size_t written =
            std::min((length - Layout::FirstEntry + Layout::EntrySize - 1) / Layout::EntrySize,
                     (Map::TableArea - Layout::FirstEntry) / Layout::EntrySize);
        Add(Severity::Fine, TableArea, fmt::format("{} entries", entries.GetItemCount()));
        if (written > entries.GetItemCount()) {
            Add(Severity::Warning, TableArea,
                fmt::format("{} entries repeat an identifier", written - entries.GetItemCount()));
        }
        AddListed(Severity::Warning, TableArea, "unknown identifiers: ", unknown);
        ReportMissing(entries, PellandoEAT::GetDefaultLogData(), 0, "the log lacks ");
        ReportMissing(entries, PellandoEAT::GetDefaultLogData(), Map::LogCopyIdOffset,
                      "the second copy of the log lacks ");
        ReportMissing(entries, PellandoEAT::GetDefaultCalibrationData(), 0, "the calibration lacks ");
    }

    void ReportMissing(const Properties& entries, const Properties& expected, std::uint16_t idOffset,
                       const char* lead) {
        std::vector<std::uint16_t> missing;
        for (const auto& [id, value] : expected.GetDatastore()) {
            if (!entries.Contains(static_cast<std::uint16_t>(id + idOffset))) {
                missing.push_back(id);
            }
        }
        AddListed(Severity::Warning, TableArea, lead, missing);
    }

    /// Where the values lie: inside the image, with their usual size, and none over another.
    void CheckPlaces(const PellandoEAT& table) {
        std::vector<Place> places{{0, Map::Table, Map::Table + Map::TableArea}};
        std::vector<std::uint16_t> outside, unusual;
        for (const auto& [id, address] : table.GetDatastore().GetDatastore()) {
            const std::uint16_t property = PropertyOfEntry(id);
            if (property == 0) {
                continue;
            }
            std::int64_t size = 0;
            try {
                size = table.SizeOf(id);
            } catch (const Utilities::Exceptions::RuntimeException&) {
                size = -1;  // nothing says where it ends
            }
            const std::int64_t first = address.AsLong();
            if (first < 0 || size < 0 || first + size > Protocol::EepromSize) {
                outside.push_back(id);
                continue;
            }
            if (static_cast<std::size_t>(size) !=
                ConfigurationDataConverter::GetDefaultProperty(property).SizeOf()) {
                unusual.push_back(id);
            }
            places.push_back({id, first, first + size});
        }
        AddListed(Severity::Error, TableArea, "values that end outside the image: ", outside);
        AddListed(Severity::Warning, TableArea, "values of another size than usual: ", unusual);
        ReportOverlaps(std::move(places));
    }

    void ReportOverlaps(std::vector<Place> places) {
        std::ranges::sort(places, {}, &Place::first);
        const Place* reaching = nullptr;  // of those so far, the one that reaches furthest
        for (const Place& place : places) {
            if (reaching != nullptr && place.first < reaching->end && place.end > place.first) {
                const auto name = [](const Place& which) {
                    return which.id == 0 ? std::string("the table") : std::to_string(which.id);
                };
                Add(Severity::Error, TableArea, name(*reaching) + " and " + name(place) + " overlap");
                return;  // one tells enough: the rest usually follows from it
            }
            if (reaching == nullptr || place.end > reaching->end) {
                reaching = &place;
            }
        }
    }

    void CheckModel(const PellandoEAT& table) {
        try {
            ImageModel model(image_);
            CheckLogs();
            CheckCalibration(model.Calibration());
            CheckWriting(table, model);
        } catch (const Utilities::Exceptions::RuntimeException& exception) {
            Add(Severity::Error, TableArea, std::string("the driver refuses the image: ") + exception.what());
        }
    }

    /// The driver writes each section from the beginning of its area on, whatever the table says, and the log
    /// whenever an object of its memory model ends.
    void CheckWriting(const PellandoEAT& table, ImageModel& model) {
        const Properties log = model.Log();
        const LogPlaces places = PlacesOf(table, log);
        if (!places.main) {
            Add(Severity::Error, LogArea, "the table has it elsewhere than the driver writes it");
        } else if (!places.second) {
            Add(Severity::Warning, LogArea,
                "the table has the second copy elsewhere than the driver writes it");
        }
        if (const std::size_t size = log.SizeOf(true); size > Map::LogSize) {
            Add(size > Map::LogArea ? Severity::Error : Severity::Warning, LogArea,
                "it reaches into the binary block");
        }
        if (!table.Locates(model.Calibration(), Map::Calibration, 0)) {
            Add(Severity::Warning, TableArea,
                "calibration values cannot be changed: the table has them elsewhere than the driver writes "
                "them");
        }
    }

    void CheckLogs() {
        const LogCopies copies = ReadLogCopies(image_);
        const auto report = [this](const char* name, const LogCopy& copy) {
            if (!copy.isReadable) {
                Add(Severity::Warning, LogArea, std::string(name) + ": the table does not hold it");
            } else if (copy.isValid) {
                Add(Severity::Fine, LogArea, fmt::format("{}: checksum 0x{:08X}", name, copy.stored));
            } else {
                Add(Severity::Warning, LogArea,
                    fmt::format("{}: checksum 0x{:08X} instead of 0x{:08X}", name, copy.stored,
                                copy.calculated));
            }
        };
        report("main copy", copies.main);
        report("second copy", copies.second);
        if (copies.main.isValid && copies.second.isValid &&
            !HaveSameBytes(copies.main.items, copies.second.items)) {
            Add(Severity::Note, LogArea, "the two copies hold different values");
        }
        const bool isLost = !copies.main.isValid && !copies.second.isValid;
        Add(isLost ? Severity::Error : Severity::Fine, LogArea,
            std::string("the driver uses ") + (isLost ? "" : "the ") + copies.Used());
    }

    void CheckCalibration(const Properties& calibration) {
        std::vector<std::uint16_t> odd;
        std::size_t untouched = 0;
        for (const auto& [id, value] : calibration.GetDatastore()) {
            const std::vector<double> numbers = NumbersOf(value);
            if (!std::ranges::all_of(numbers, [](double number) { return std::isfinite(number); })) {
                odd.push_back(id);
            }
            if (std::ranges::all_of(numbers, [](double number) { return number == -1; })) {
                ++untouched;
            }
        }
        Add(Severity::Fine, CalibrationArea, fmt::format("{} values", calibration.GetItemCount()));
        AddListed(Severity::Warning, CalibrationArea, "values that are no numbers: ", odd);
        if (untouched > 0) {
            Add(Severity::Note, CalibrationArea,
                fmt::format("{} values are -1, as in a fresh instrument", untouched));
        }
    }

    void CheckOtherAreas() {
        Add(Severity::Fine, "binary block", UseOfBinaryBlock(image_));
        std::set<std::uint32_t> words;
        for (std::uint32_t at = Map::RawWords; at < Map::EndOfLogArea; ++at) {
            if (image_[at] != 0xFF) {
                words.insert(at / Map::RawWordSize);
            }
        }
        Add(Severity::Fine, "raw words",
            words.empty() ? "empty"
                          : fmt::format("{} of {} used", words.size(),
                                        (Map::EndOfLogArea - Map::RawWords) / Map::RawWordSize));
        const std::size_t rest =
            CountUsed(std::span(image_).subspan(Map::Calibration + Map::CalibrationSize));
        if (rest > 0) {
            Add(Severity::Note, "rest", fmt::format("{} bytes behind the calibration data are used", rest));
        }
    }

    const EepromImage& image_;
    std::vector<ImageFinding> findings_;
};

}  // namespace

std::vector<ImageFinding> CheckImage(const EepromImage& image) {
    return Checker(image).Run();
}

std::string UseOfBinaryBlock(const EepromImage& image) {
    const std::vector<std::uint8_t> block = BinaryBlockOf(image);
    const std::size_t used = CountUsed(block);
    return used == 0 ? "empty" : fmt::format("{} of {} bytes used", used, block.size());
}

bool IsSane(const std::vector<ImageFinding>& findings) {
    return std::ranges::find(findings, Severity::Error, &ImageFinding::severity) == findings.end();
}

std::string ErrorsOf(const std::vector<ImageFinding>& findings) {
    std::string errors;
    for (const ImageFinding& finding : findings) {
        if (finding.severity == Severity::Error) {
            errors += (errors.empty() ? "" : "; ") + finding.area + ": " + finding.text;
        }
    }
    return errors;
}

const char* NameOf(ImageFinding::Severity severity) {
    static constexpr const char* names[] = {"ok", "note", "warning", "error"};
    return names[static_cast<std::size_t>(severity)];
}

}  // namespace Varnholt::Service
