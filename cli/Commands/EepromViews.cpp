#include <fmt/format.h>
#include <fmt/ostream.h>

#include "Commands/AllCommands.h"
#include "Memory/InputFile.h"
#include "Memory/MemoryTarget.h"
#include "Output/ValueList.h"
#include "Protocol/ByteOrder.h"
#include "Protocol/EepromMap.h"
#include "Protocol/PropertyIdentifiers.h"
#include "Service/Memory/ImageCheck.h"
#include "Service/Memory/ImageDiff.h"
#include "Service/Memory/ImageEdit.h"
#include "Service/Memory/ImageModel.h"

namespace Varnholt::Cli {
namespace {

using namespace Service;

namespace Map = Protocol::EepromMap;
namespace Ids = Protocol::PropertyIds;

Json JsonOfCopy(const LogCopy& copy) {
    return {{"readable", copy.isReadable},
            {"valid", copy.isValid},
            {"stored", copy.stored},
            {"calculated", copy.calculated}};
}

Json JsonOfImage(const MemoryTarget& target, ImageModel& model, const LogCopies& copies) {
    Json entries = Json::Array();
    const ImageModel::Properties table = model.Table();
    for (const auto& [id, address] : table.GetDatastore()) {
        entries.Append({{"id", id}, {"address", address.AsLong()}});
    }
    Json words;
    for (std::uint16_t id = Ids::FirstRawWord; id <= LastWritableRawWord; ++id) {
        words.Add(std::to_string(id), RawWordOf(target.Image(), id));
    }
    const std::uint8_t* const header = target.Image().data() + Map::Table;
    return {{"source", target.Name()},
            {"table",
             {{"version", Protocol::LoadBig16(header + Map::TableLayout::Version)},
              {"length", Protocol::LoadBig16(header + Map::TableLayout::Length)},
              {"entries", entries}}},
            {"calibration", model.Calibration()},
            {"log",
             {{"used", copies.Used()},
              {"main", JsonOfCopy(copies.main)},
              {"second", JsonOfCopy(copies.second)},
              {"values", model.Log()}}},
            {"binary", fmt::format("{:02x}", fmt::join(BinaryBlockOf(target.Image()), ""))},
            {"words", words}};
}

void PrintRawAreas(Session& session, const EepromImage& image) {
    fmt::print(session.Out(), "\nBINARY BLOCK (10100): {}\n", UseOfBinaryBlock(image));
    session.Out() << "RAW WORDS (10200 to 10215):\n";
    constexpr std::uint16_t inARow = 8;
    for (std::uint16_t first = Ids::FirstRawWord; first <= LastWritableRawWord; first += inARow) {
        fmt::print(session.Out(), "{:>6}:", first);
        for (std::uint16_t i = 0; i < inARow; ++i) {
            fmt::print(session.Out(), " {:08X}", RawWordOf(image, static_cast<std::uint16_t>(first + i)));
        }
        session.Out() << '\n';
    }
}

struct ShowOptions : MemoryOptions {
    bool numbers = false;
};

void ShowEeprom(Session& session, const ShowOptions& options) {
    const MemoryTarget target(session, options, MemoryTarget::Use::Read);
    ImageModel model = target.Interpret([](const EepromImage& image) { return ImageModel(image); });
    const LogCopies copies = ReadLogCopies(target.Image());
    if (options.json) {
        session.Print(JsonOfImage(target, model, copies));
        return;
    }
    const Vectors vectors = options.numbers ? Vectors::Numbers : Vectors::Plotted;
    const std::string used = copies.main.isValid || copies.second.isValid
                                 ? std::string("from the ") + copies.Used()
                                 : "both copies are damaged: empty";
    fmt::print(session.Out(), "{}: allocation table of {} entries\n\nCALIBRATION\n", target.Name(),
               model.Table().GetItemCount());
    PrintValues(session, model.Calibration(), vectors);
    fmt::print(session.Out(), "\nUSAGE LOG ({})\n", used);
    PrintValues(session, model.Log(), vectors);
    PrintRawAreas(session, target.Image());
}

void Check(Session& session, const MemoryOptions& options) {
    const MemoryTarget target(session, options, MemoryTarget::Use::Read);
    const std::vector<ImageFinding> findings = CheckImage(target.Image());
    const bool isSane = IsSane(findings);
    Rows rows({{"", "severity"}, {"", "area"}, {"", "text"}});
    for (const ImageFinding& finding : findings) {
        rows.Add({NameOf(finding.severity), finding.area, finding.text});
    }
    session.Print(options.json, {{"source", target.Name()}, {"sane", isSane}, {"findings", rows.AsJson()}},
                  rows.Text() + target.Name() + (isSane ? " can be used\n" : " cannot be used as it is\n"));
    if (!isSane) {
        throw Failure(FailureKind::BadData, target.Name() + " has errors");
    }
}

struct DiffOptions : MemoryOptions {
    std::string a;
};

Rows::Cell CellOfSide(const std::optional<Property>& value, bool isWord) {
    if (!value) {
        return {"(none)", Json()};
    }
    return isWord ? CellOfWord(static_cast<std::uint32_t>(value->AsLong())) : CellOf(*value);
}

std::string TextOfDifference(const ImageDiff::Value& value, const std::string& textOfA,
                             const std::string& textOfB) {
    if (value.a && value.b && IsLongVector(*value.a) && IsLongVector(*value.b)) {
        const std::vector<double> a = NumbersOf(*value.a);
        const std::vector<double> b = NumbersOf(*value.b);
        if (a.size() == b.size()) {
            std::size_t different = 0, first = 0;
            for (std::size_t i = a.size(); i-- > 0;) {
                if (a[i] != b[i]) {
                    ++different;
                    first = i;
                }
            }
            return fmt::format("{} of {} elements, the first at {}: {} -> {}", different, a.size(), first,
                               a[first], b[first]);
        }
    }
    return textOfA + " -> " + textOfB;
}

/// Which of the two has no values, and why; empty where both have.
std::string TextOfUnreadable(const ImageDiff& diff, const std::string& a, const std::string& b) {
    std::string text;
    for (const auto& [name, reason] : {std::pair(a, diff.unreadableA), std::pair(b, diff.unreadableB)}) {
        if (!reason.empty()) {
            text.append(text.empty() ? "" : "; ").append(name).append(": ").append(reason);
        }
    }
    return text;
}

Rows RowsOf(const std::vector<ImageDiff::Value>& values) {
    Rows rows({{"WHAT", "kind"},
               {"ID", "id", Rows::Right},
               {"DIFFERENCE"},
               {"", "a", Rows::Hidden},
               {"", "b", Rows::Hidden}});
    for (const ImageDiff::Value& value : values) {
        const bool isWord = value.kind == "word";
        const Rows::Cell a = CellOfSide(value.a, isWord);
        const Rows::Cell b = CellOfSide(value.b, isWord);
        rows.Add({value.kind, value.id, TextOfDifference(value, a.text, b.text), a, b});
    }
    return rows;
}

Rows RowsOf(const std::vector<ImageDiff::Area>& areas) {
    Rows rows({{"AREA", "area"},
               {"ADDRESSES"},
               {"", "first", Rows::Hidden},
               {"", "last", Rows::Hidden},
               {"BYTES", "differentBytes", Rows::Right},
               {"FIRST AT", "firstDifference", Rows::Right}});
    for (const ImageDiff::Area& area : areas) {
        rows.Add({area.name, fmt::format("{} to {}", area.first, area.last), area.first, area.last,
                  area.different, area.firstDifference});
    }
    return rows;
}

void Diff(Session& session, const DiffOptions& options) {
    const EepromImage a = ReadImageFile(session, options.a);
    const std::string nameOfA = ShownSource(options.a);
    const MemoryTarget b(session, options, MemoryTarget::Use::Read);
    const ImageDiff diff = Compare(a, b.Image());
    const std::string unreadable = TextOfUnreadable(diff, nameOfA, b.Name());
    const Rows values = RowsOf(diff.values);
    const Rows areas = RowsOf(diff.areas);
    if (options.json) {
        session.Print({{"a", nameOfA},
                       {"b", b.Name()},
                       {"same", diff.IsEmpty()},
                       {"unreadable", Json::OrNull(unreadable)},
                       {"values", values.AsJson()},
                       {"areas", areas.AsJson()}});
    } else if (diff.IsEmpty()) {
        fmt::print(session.Out(), "{} and {} are the same\n", nameOfA, b.Name());
    } else {
        if (!unreadable.empty()) {
            session.Warn("calibration and log cannot be compared: " + unreadable);
        }
        session.Out() << (values.IsEmpty() ? "" : values.Text() + "\n") << areas.Text();
    }
    if (!diff.IsEmpty()) {
        throw Failure(FailureKind::Different, nameOfA + " and " + b.Name() + " differ");
    }
}

}  // namespace

void AddEepromViews(CommandSpec group, Session& session) {
    auto [show, showOptions] =
        NewCommand(group, session, "show", "show what is in an EEPROM or an image", ShowEeprom);
    show.Under("Output").Add("--numbers", showOptions.numbers, "show vectors as numbers, not as plots");
    AddMemoryOptions(show, showOptions, "FILE");

    auto [check, checkOptions] = NewCommand(
        group, session, "check",
        "check table, logs, checksums and areas, and tell what the driver would use of them", Check);
    AddMemoryOptions(check, checkOptions, "FILE");

    auto [diff, diffOptions] = NewCommand(group, session, "diff",
                                          "compare two images, or an image and an instrument, by value and "
                                          "by area; exit code 9 when they differ",
                                          Diff);
    diff.Add("A", diffOptions.a, "image file; `-` is standard input", {.isRequired = true});
    AddMemoryOptions(diff, diffOptions, "B");
}

}  // namespace Varnholt::Cli
