#include <algorithm>

#include "Commands/AllCommands.h"
#include "Memory/MemoryTarget.h"
#include "Output/ValueList.h"
#include "Protocol/PropertyIdentifiers.h"
#include "Service/Memory/ImageEdit.h"
#include "Service/Number.h"

namespace Varnholt::Cli {
namespace {

using namespace Service;

struct GetWordOptions : MemoryOptions {
    std::vector<std::uint16_t> ids;
};

void GetWord(Session& session, const GetWordOptions& options) {
    std::vector<std::uint16_t> ids = options.ids;
    if (ids.empty()) {
        for (std::uint16_t id = Protocol::PropertyIds::FirstRawWord; id <= LastWritableRawWord; ++id) {
            ids.push_back(id);
        }
    }
    const MemoryTarget target(session, options, MemoryTarget::Use::Read);
    Json words;
    Rows table({{"ID", nullptr, Rows::Right}, {"WORD"}, {"", nullptr, Rows::Right}});
    for (auto id = ids.begin(); id != ids.end(); ++id) {
        const std::uint32_t word = RawWordOf(target.Image(), *id);
        table.Add({*id, CellOfWord(word), word});
        if (std::find(ids.begin(), id, *id) == id) {  // the first of its kind
            words.Add(std::to_string(*id), word);
        }
    }
    session.Print(options.json, {{"source", target.Name()}, {"words", words}}, table.Text());
}

struct PutWordOptions : MemoryOptions {
    ChangeOptions change;
    std::vector<std::string> assignments;
};

void PutWord(Session& session, const PutWordOptions& options) {
    std::vector<std::pair<std::uint16_t, std::uint32_t>> words;
    for (const Assignment& assignment : ParseAssignments(options.assignments)) {
        const auto value = ParseNumber<std::uint32_t>(assignment.value);
        if (!value) {
            throw Failure(FailureKind::BadArgument, "'" + assignment.value + "' is no 32-bit number",
                          "for example 10200=0x01020304");
        }
        words.emplace_back(assignment.id, *value);
    }
    MemoryTarget target(session, options, MemoryTarget::Use::Change);
    EepromImage edited = target.Image();
    Rows changes({{"ID", "id", Rows::Right}, {"BEFORE", "before"}, {}, {"AFTER", "after"}});
    for (const auto& [id, word] : words) {
        const std::uint32_t before = RawWordOf(edited, id);
        SetRawWord(edited, id, word);
        changes.Add({id, CellOfWord(before), "->", CellOfWord(word)});
    }
    target.Change(edited, options.change, changes);
}

}  // namespace

void AddWord(CommandSpec app, Session& session) {
    CommandSpec group = app.AddGroup("word", "read and write raw words of the EEPROM, 4 bytes each");

    auto [get, getOptions] = NewCommand(group, session, "get", "show raw words", GetWord);
    get.Add("ID", getOptions.ids, "10200 to 10239 (default: 10200 to 10215; those behind are the table's)");
    AddMemoryOptions(get, getOptions);

    auto [put, putOptions] = NewCommand(group, session, "put", "write raw words", PutWord);
    put.Add("ID=VALUE", putOptions.assignments, "words 10200 to 10215, decimal or 0x...",
            {.isRequired = true});
    AddChangeOptions(put, putOptions.change);
    AddMemoryOptions(put, putOptions);
}

}  // namespace Varnholt::Cli
