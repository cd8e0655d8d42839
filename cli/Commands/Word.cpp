#include <limits>

#include "Commands/AllCommands.h"
#include "Commands/CommonOptions.h"
#include "Memory/MemoryTarget.h"
#include "Output/Json.h"
#include "Output/Rows.h"
#include "Output/ValueList.h"
#include "Protocol/PropertyIdentifiers.h"
#include "Service/Memory/ImageEdit.h"
#include "Service/Number.h"

namespace Varnholt::Cli {
namespace {

using namespace Service;

struct GetWordOptions {
    MemoryOptions memory;
    std::vector<std::uint16_t> ids;
};

void GetWord(Session& session, const GetWordOptions& options) {
    std::vector<std::uint16_t> ids = options.ids;
    if (ids.empty()) {
        for (std::uint16_t id = Protocol::PropertyIds::FirstRawWord; id <= LastWritableRawWord; ++id) {
            ids.push_back(id);
        }
    }
    const MemoryTarget target(session, options.memory, MemoryTarget::Use::Read);
    Json words;
    Table table({{"ID", Table::Align::Right}, {"WORD"}, {"", Table::Align::Right}});
    for (const std::uint16_t id : ids) {
        const std::uint32_t word = RawWordOf(target.Image(), id);
        words.Add(std::to_string(id), word);
        table.AddRow({std::to_string(id), CellOfWord(word).text, std::to_string(word)});
    }
    if (options.memory.json) {
        session.Print({{"source", target.Name()}, {"words", words}});
    } else {
        table.Print(session.Out());
    }
}

struct PutWordOptions {
    MemoryOptions memory;
    ChangeOptions change;
    std::vector<std::string> assignments;
};

void PutWord(Session& session, const PutWordOptions& options) {
    struct Word {
        std::uint16_t id;
        std::uint32_t value;
    };
    std::vector<Word> words;
    for (const Assignment& assignment : ParseAssignments(options.assignments)) {
        std::uint64_t value = 0;
        if (!ParseNumber(assignment.value, std::numeric_limits<std::uint32_t>::max(), value)) {
            throw Failure(FailureKind::BadArgument, "'" + assignment.value + "' is no 32-bit number",
                          "for example 10200=0x01020304");
        }
        words.push_back({assignment.id, static_cast<std::uint32_t>(value)});
    }
    MemoryTarget target(session, options.memory, MemoryTarget::Use::Change);
    EepromImage edited = target.Image();
    Rows changes({{"ID", "id", Table::Align::Right}, {"BEFORE", "before"}, {}, {"AFTER", "after"}});
    for (const Word& word : words) {
        const std::uint32_t before = RawWordOf(edited, word.id);
        SetRawWord(edited, word.id, word.value);
        changes.Add({word.id, CellOfWord(before), "->", CellOfWord(word.value)});
    }
    target.Change(edited, options.change, Granularity::Elements, {{"changes", changes.AsJson()}},
                  [&] { changes.Print(session.Out()); });
}

}  // namespace

void AddWord(CommandSpec app, Session& session) {
    CommandSpec group = app.AddGroup("word", "read and write raw words of the EEPROM, 4 bytes each");

    auto [get, getOptions] = NewCommand(group, session, "get", "show raw words", GetWord);
    get.Add("ID", getOptions.ids, "10200 to 10239 (default: 10200 to 10215; those behind are the table's)");
    AddMemoryOptions(get, getOptions.memory);

    auto [put, putOptions] = NewCommand(group, session, "put", "write raw words", PutWord);
    put.Add("ID=VALUE", putOptions.assignments, "words 10200 to 10215, decimal or 0x...").Required();
    AddChangeOptions(put, putOptions.change);
    AddMemoryOptions(put, putOptions.memory);
}

}  // namespace Varnholt::Cli
